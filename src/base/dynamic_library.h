// dlopen(3) of a shared library.
#ifndef TAVOW3_SRC_BASE_DYNAMIC_LIBRARY_H_
#define TAVOW3_SRC_BASE_DYNAMIC_LIBRARY_H_

#include <string>

#include "base/export.h"

namespace tavow3::base {

// Opens the library with `flags` (RTLD_*) and closes the handle again at once;
// with RTLD_NODELETE the library and what its initialisers registered stay.
// Returns false and stores the loader's message in *error on failure.
TAVOW3_INTERNAL bool LoadLibraryOnce(const std::string& path, int flags, std::string* error);

}  // namespace tavow3::base

#endif  // TAVOW3_SRC_BASE_DYNAMIC_LIBRARY_H_
