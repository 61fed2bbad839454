// Fault injection for the system-call wrappers. Every wrapper calls Fire()
// first; while a test holds an Arm, the Nth call (counted across all wrappers,
// or only those of one operation) fails with the armed errno. Disarmed, Fire()
// costs one relaxed atomic load. Arming is process-wide and not meant to be
// used from two threads at once.
#ifndef TAVOW3_SRC_BASE_FAULT_H_
#define TAVOW3_SRC_BASE_FAULT_H_

#include "base/export.h"

namespace tavow3::base::fault {

enum class Op {
  kAny,  // matches every operation when arming
  kOpen,
  kRead,
  kWrite,
  kFsync,
  kClose,
  kRename,
  kMkstemp,
  kChown,
  kChmod,
  kMkdir,
  kRmdir,
  kUnlink,
  kStat,
  kSymlink,
  kReadlink,
  kFlock,
  kShmOpen,
  kShmUnlink,
  kTruncate,
  kMmap,
  kGlob,
  kOpendir,
  kSpawn,
  kFork,
  kWaitpid,
  kKill,
  kDlopen,
  kSyslog,
};

enum Mode { kOnce, kPersistent };

// Returns true when the current call of `op` must fail; errno is then set.
TAVOW3_INTERNAL bool Fire(Op op);

// Arms the hook for its lifetime: the `nth` matching call (1-based) fails with
// `error`, and with kPersistent every matching call after it too.
class TAVOW3_INTERNAL Arm {
 public:
  Arm(int nth, Mode mode, int error, Op only = Op::kAny);
  ~Arm();
  Arm(const Arm&) = delete;
  Arm& operator=(const Arm&) = delete;

  // True when at least one call failed because of this arm.
  bool fired() const;
  // Matching calls seen since arming.
  int calls() const;
};

}  // namespace tavow3::base::fault

#endif  // TAVOW3_SRC_BASE_FAULT_H_
