// File work of the generator: directories, programs and file tests. Files
// are replaced through tavomustache::WriteFileAtomically.
#ifndef TAVO_APPLIANCE_NGINX_GEN_FILES_H_
#define TAVO_APPLIANCE_NGINX_GEN_FILES_H_

#include <string>
#include <vector>

namespace tavonginxgen {

// Creates `path` and its missing parents with mode 0755. False with a
// message in *error.
bool MakeDirectories(const std::string& path, std::string* error);

// Runs `argv` (no shell) with standard input from /dev/null and its output
// and error collected in *output. Returns the exit status, or -1 when it
// could not run or was killed (with a message in *output).
int RunCollecting(const std::vector<std::string>& argv, std::string* output);

bool FileExists(const std::string& path);

}  // namespace tavonginxgen

#endif  // TAVO_APPLIANCE_NGINX_GEN_FILES_H_
