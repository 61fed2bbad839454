// File operations library. Thread-safe.
#ifndef TAVO_TAVOFS_H_
#define TAVO_TAVOFS_H_

#include <sys/types.h>

// Creates `path` and every missing parent with `mode`; existing directories
// are left as they are. `flags` is reserved and must be 0. Returns 0 on
// success (also when `path` already is a directory), -1 with errno set
// (ENOTDIR when a component is not a directory).
int TAVOFSMkdirP(const char* path, int flags, mode_t mode);

// As above; when `set_owner` is non-zero every directory this call creates is
// also given owner `uid` and group `gid`. Directories that existed keep their
// owner. Called as TAVOFSMkdirP(dir, 0, 1, 1, 1, 0755) by the settings code.
int TAVOFSMkdirP(const char* path, int flags, int set_owner, uid_t uid, gid_t gid, mode_t mode);

// Copies the regular file `from` to `to` through a temporary file beside `to`
// that is renamed into place, so readers see the old or the new file. The copy
// gets the mode of `from`. Returns 0 on success, -1 with errno set; on failure
// `to` is unchanged and no temporary file is left.
int TAVOFileCopy(const char* from, const char* to);

#endif  // TAVO_TAVOFS_H_
