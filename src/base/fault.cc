#include "base/fault.h"

#include <atomic>
#include <cerrno>

namespace tavow3::base::fault {
namespace {

std::atomic<bool> g_armed{false};
std::atomic<int> g_calls{0};
std::atomic<int> g_fired{0};
int g_nth = 0;
Mode g_mode = kOnce;
int g_error = 0;
Op g_only = Op::kAny;

}  // namespace

bool Fire(Op op) {
  if (!g_armed.load(std::memory_order_relaxed)) return false;
  if (g_only != Op::kAny && g_only != op) return false;
  const int call = ++g_calls;
  if (call == g_nth || (g_mode == kPersistent && call > g_nth)) {
    ++g_fired;
    errno = g_error;
    return true;
  }
  return false;
}

Arm::Arm(int nth, Mode mode, int error, Op only) {
  g_nth = nth;
  g_mode = mode;
  g_error = error;
  g_only = only;
  g_calls = 0;
  g_fired = 0;
  g_armed.store(true);
}

Arm::~Arm() { g_armed.store(false); }

bool Arm::fired() const { return g_fired.load() > 0; }

int Arm::calls() const { return g_calls.load(); }

}  // namespace tavow3::base::fault
