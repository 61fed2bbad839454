// The flag file that pins the web server to its Default configuration.
#ifndef TAVOW3_SRC_DEPLOY_FORCE_DEFAULT_FLAG_H_
#define TAVOW3_SRC_DEPLOY_FORCE_DEFAULT_FLAG_H_

#include <tavo/tlib_file.h>

namespace tavow3::deploy {

// Created by the force-default operator; nothing in the library removes it.
inline constexpr char kForceDefaultDir[] = "/run/tavow3";
inline constexpr char kForceDefaultFlag[] = "/run/tavow3/force_default";

// True when the flag exists (symbolic links followed).
inline bool IsForceDefaultFlagSet() { return TLIBCFileExist(kForceDefaultFlag) == 1; }

}  // namespace tavow3::deploy

#endif  // TAVOW3_SRC_DEPLOY_FORCE_DEFAULT_FLAG_H_
