#include "base/dynamic_library.h"

#include <dlfcn.h>

#include <cerrno>
#include <cstring>

#include "base/fault.h"

namespace tavow3::base {

bool LoadLibraryOnce(const std::string& path, int flags, std::string* error) {
  if (fault::Fire(fault::Op::kDlopen)) {
    *error = path + ": " + std::strerror(errno);
    return false;
  }
  void* handle = ::dlopen(path.c_str(), flags);
  if (handle == nullptr) {
    const char* message = ::dlerror();
    *error = message != nullptr ? message : path + ": cannot load";
    return false;
  }
  // With RTLD_NODELETE the library stays mapped; without it, this unloads it.
  (void)::dlclose(handle);
  return true;
}

}  // namespace tavow3::base
