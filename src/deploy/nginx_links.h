// The file work of the deployers: symbolic links under /etc/nginx and the
// backups of whatever stands in their way.
#ifndef TAVOW3_SRC_DEPLOY_NGINX_LINKS_H_
#define TAVOW3_SRC_DEPLOY_NGINX_LINKS_H_

#include <string>

#include "base/export.h"

namespace tavow3::deploy {

// Makes `link` a symbolic link to the directory `target`, creating the
// directory (mode 0755, with parents) when missing. A non-directory at
// `target` and anything but the right link at `link` are removed first
// (RemovePath). An already correct link is left untouched. True also when the
// final symlink(2) failed (logged); false, logged, for empty arguments or a
// failed removal or directory creation.
TAVOW3_INTERNAL bool MakeLink(const std::string& target, const std::string& link);

// Removes `path`: a symbolic link is unlinked; anything else is moved aside
// to "<path>_XXXXXX" (six unique characters), or unlinked when that move
// fails. False, logged, when nothing worked.
TAVOW3_INTERNAL bool RemovePath(const std::string& path);

}  // namespace tavow3::deploy

#endif  // TAVOW3_SRC_DEPLOY_NGINX_LINKS_H_
