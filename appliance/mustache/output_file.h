// File input and output of tavomustache.
#ifndef TAVO_APPLIANCE_MUSTACHE_OUTPUT_FILE_H_
#define TAVO_APPLIANCE_MUSTACHE_OUTPUT_FILE_H_

#include <string>

namespace tavomustache {

// Reads the whole file `path` into *content. False with a message in *error.
bool ReadWholeFile(const std::string& path, std::string* content, std::string* error);

// Creates a temporary file beside `path` whose name no glob of the directory
// matches (".name.XXXXXX"), so a reader that includes "dir/*.conf" never sees
// a half-written file. Returns the open descriptor and the name in *temp, or
// -1 with a message in *error.
int MakeHiddenTemp(const std::string& path, std::string* temp, std::string* error);

// Replaces `path` by `content` (mode 0644): a hidden temporary file beside it
// is written, flushed to disk and renamed over it, so readers see the old or
// the new file. False with a message in *error; `path` is then unchanged and
// the temporary removed.
bool WriteFileAtomically(const std::string& path, const std::string& content, std::string* error);

}  // namespace tavomustache

#endif  // TAVO_APPLIANCE_MUSTACHE_OUTPUT_FILE_H_
