// Copies the staged appliance tree over the sandbox's root.
#ifndef TAVOW3_TOOLS_SANDBOX_INIT_TREE_COPY_H_
#define TAVOW3_TOOLS_SANDBOX_INIT_TREE_COPY_H_

#include <string>

namespace tavow3::sandbox {

// Copies the entries of the directory open as `source_fd` into `dest` (an
// existing directory that keeps its own owner and mode), like "cp -a SOURCE/.
// DEST" without hard links: directories are merged, files and symbolic links
// replace what is there, owner, mode and times are kept. Returns false with a message on stderr at
// the first entry that cannot be copied (devices, sockets and FIFOs cannot).
bool CopyTree(int source_fd, const std::string& dest);

}  // namespace tavow3::sandbox

#endif  // TAVOW3_TOOLS_SANDBOX_INIT_TREE_COPY_H_
