// File work of the generator: directories and atomic replacement.
#ifndef TAVO_APPLIANCE_NGINX_GEN_FILES_H_
#define TAVO_APPLIANCE_NGINX_GEN_FILES_H_

#include <string>
#include <vector>

namespace tavonginxgen {

// Creates `path` and its missing parents with mode 0755. False with a
// message in *error.
bool MakeDirectories(const std::string& path, std::string* error);

// A temporary name beside `path` that no nginx include pattern matches: the
// base name is hidden (".name.XXXXXX"). Returns the open descriptor and the
// name in *temp, or -1 with a message in *error.
int MakeHiddenTemp(const std::string& path, std::string* temp, std::string* error);

// Replaces `path` by `content` with mode 0644: a hidden temporary beside it
// is written, flushed and renamed over it. On failure `path` is unchanged,
// the temporary removed, and *error says why.
bool ReplaceFile(const std::string& path, const std::string& content, std::string* error);

// Runs `argv` (no shell) with standard input from /dev/null and its output
// and error collected in *output. Returns the exit status, or -1 when it
// could not run or was killed (with a message in *output).
int RunCollecting(const std::vector<std::string>& argv, std::string* output);

bool FileExists(const std::string& path);

}  // namespace tavonginxgen

#endif  // TAVO_APPLIANCE_NGINX_GEN_FILES_H_
