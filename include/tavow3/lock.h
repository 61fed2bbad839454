// The web-server configuration generation lock.
#ifndef TAVOW3_LOCK_H_
#define TAVOW3_LOCK_H_

#include <tavow3/export.h>

// An exclusive flock on "/run/lock/nginx_gen.lock", which serialises the
// generation and deployment of the web server's configuration between
// processes. The file is opened (created when missing) by the constructor and
// locked only by lock(); the destructor unlocks and closes it. Used by one
// thread at a time.
class TAVOW3_EXPORT Lock {
 public:
  // Opens the lock file; a failure is silent and makes every lock() fail.
  Lock();
  ~Lock();
  Lock(const Lock&) = delete;
  Lock& operator=(const Lock&) = delete;

  // Blocks until the exclusive lock is held. False when the file could not
  // be opened or the lock not taken.
  [[nodiscard]] bool lock();
  // Releases the lock; the file stays open.
  void unlock();

 private:
  int fd_;  // -1 when the file could not be opened
};

#endif  // TAVOW3_LOCK_H_
