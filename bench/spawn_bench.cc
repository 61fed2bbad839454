// Starting a short program through the platform API, beside the bare
// posix_spawn it is built on, and beside fork+exec, whose cost grows with the
// caller's memory. The argument is the caller's extra resident memory in MiB.
#include <benchmark/benchmark.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstring>
#include <vector>

#include "tavo/tlib_exec.h"

extern char** environ;

namespace {

// Touched memory that makes this process as large as a busy caller.
std::vector<char> Ballast(int64_t mib) {
  std::vector<char> ballast(static_cast<size_t>(mib) << 20);
  std::memset(ballast.data(), 1, ballast.size());
  return ballast;
}

void BM_TLIBCExecTrue(benchmark::State& state) {
  std::vector<char> ballast = Ballast(state.range(0));
  for (auto _ : state) benchmark::DoNotOptimize(TLIBCExec("/bin/true"));
}
BENCHMARK(BM_TLIBCExecTrue)->Arg(0)->Arg(512)->Unit(benchmark::kMicrosecond);

void BM_RawPosixSpawnTrue(benchmark::State& state) {
  std::vector<char> ballast = Ballast(state.range(0));
  char* argv[] = {const_cast<char*>("/bin/true"), nullptr};
  for (auto _ : state) {
    pid_t pid;
    int status = 0;
    if (::posix_spawn(&pid, argv[0], nullptr, nullptr, argv, environ) == 0) {
      ::waitpid(pid, &status, 0);
    }
    benchmark::DoNotOptimize(status);
  }
}
BENCHMARK(BM_RawPosixSpawnTrue)->Arg(0)->Arg(512)->Unit(benchmark::kMicrosecond);

void BM_ForkExecTrue(benchmark::State& state) {
  std::vector<char> ballast = Ballast(state.range(0));
  for (auto _ : state) {
    pid_t pid = ::fork();
    if (pid == 0) {
      ::execl("/bin/true", "/bin/true", static_cast<char*>(nullptr));
      ::_exit(127);
    }
    int status = 0;
    if (pid > 0) ::waitpid(pid, &status, 0);
    benchmark::DoNotOptimize(status);
  }
}
BENCHMARK(BM_ForkExecTrue)->Arg(0)->Arg(512)->Unit(benchmark::kMicrosecond);

void BM_TLIBCPopenTrue(benchmark::State& state) {
  const char* argv[] = {"/bin/true", nullptr};
  for (auto _ : state) {
    FILE* stream = TLIBCPopen(argv, "rB");
    if (stream != nullptr) benchmark::DoNotOptimize(TLIBCPclose(stream));
  }
}
BENCHMARK(BM_TLIBCPopenTrue)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
