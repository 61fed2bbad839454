// The runtime port scan (Engine::IsRuntimeTCPPortConflict on a free port)
// beside its floor, the bare reads of the same inputs: the pid file, the
// TCP tables and the web-server master's descriptor links.
//
// Run it inside the sandbox, which gives it a network namespace of its own
// and a scratch /run (it writes /run/nginx.pid):
//
//   tools/sandbox --root build/sandbox-root -- build/bench/port_scan_bench
//
// Each size is a pair: sockets in the TCP tables held by foreign processes
// (established loopback connections, both ends, a quarter of them IPv6) and
// descriptors held by the web-server master (IPv4 listeners, also in the
// tables). Child processes hold the sockets, at most kSocketsPerChild each.
// BM_ScanOverFloor alternates scan and floor in one loop and reports their
// ratio, which holds up better than two separate runs on a busy machine.
#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <memory>
#include <string>
#include <vector>

#include <tavow3/engine.h>

#include "base/file_io.h"
#include "engine/tcp_table.h"

namespace {

constexpr int kSocketsPerChild = 15000;
constexpr int kConnectionsPerListener = 4000;
constexpr unsigned short kFreePort = 9;  // nothing listens on it
constexpr char kPidFile[] = "/run/nginx.pid";
constexpr char kSandboxMarker[] = "/run/tavow3-sandbox";
constexpr const char* kTables[] = {"/proc/net/tcp", "/proc/net/tcp6"};

[[noreturn]] void Die(const char* what) {
  std::fprintf(stderr, "port_scan_bench: %s: %s\n", what, std::strerror(errno));
  std::exit(2);
}

void RaiseDescriptorLimit() {
  rlimit limit;
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0) Die("getrlimit");
  rlimit wanted = {1 << 20, 1 << 20};
  if (setrlimit(RLIMIT_NOFILE, &wanted) == 0) return;
  limit.rlim_cur = limit.rlim_max;
  if (setrlimit(RLIMIT_NOFILE, &limit) != 0) Die("setrlimit");
}

// 50,000 connections and 10,000 listeners do not fit the default range of
// ephemeral ports. The setting belongs to the sandbox's network namespace.
void WidenEphemeralPorts() {
  FILE* range = std::fopen("/proc/sys/net/ipv4/ip_local_port_range", "w");
  if (range == nullptr || std::fputs("1024 65535\n", range) < 0 || std::fclose(range) != 0) {
    Die("widen the ephemeral port range");
  }
}

socklen_t Loopback(int family, unsigned short port, sockaddr_storage* address) {
  std::memset(address, 0, sizeof *address);
  if (family == AF_INET) {
    auto* in = reinterpret_cast<sockaddr_in*>(address);
    in->sin_family = AF_INET;
    in->sin_port = htons(port);
    in->sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return sizeof *in;
  }
  auto* in6 = reinterpret_cast<sockaddr_in6*>(address);
  in6->sin6_family = AF_INET6;
  in6->sin6_port = htons(port);
  in6->sin6_addr = in6addr_loopback;
  return sizeof *in6;
}

int ListenOn(int family, unsigned short port) {
  const int fd = socket(family, SOCK_STREAM, 0);
  if (fd < 0) Die("socket");
  const int on = 1;
  setsockopt(fd, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
  sockaddr_storage address;
  const socklen_t length = Loopback(family, port, &address);
  if (bind(fd, reinterpret_cast<sockaddr*>(&address), length) != 0) Die("bind");
  if (listen(fd, 4096) != 0) Die("listen");
  return fd;
}

unsigned short PortOf(int fd) {
  sockaddr_storage address;
  socklen_t length = sizeof address;
  if (getsockname(fd, reinterpret_cast<sockaddr*>(&address), &length) != 0) Die("getsockname");
  return ntohs(address.ss_family == AF_INET
                   ? reinterpret_cast<sockaddr_in*>(&address)->sin_port
                   : reinterpret_cast<sockaddr_in6*>(&address)->sin6_port);
}

// Opens `connections` loopback connections and keeps both ends.
void Connect(int family, int connections) {
  int listener = -1;
  sockaddr_storage address;
  socklen_t length = 0;
  for (int i = 0; i < connections; ++i) {
    if (i % kConnectionsPerListener == 0) {
      listener = ListenOn(family, 0);
      length = Loopback(family, PortOf(listener), &address);
    }
    const int client = socket(family, SOCK_STREAM, 0);
    if (client < 0) Die("socket");
    if (connect(client, reinterpret_cast<sockaddr*>(&address), length) != 0) Die("connect");
    if (accept(listener, nullptr, nullptr) < 0) Die("accept");
  }
}

// A child process that runs `make` and holds what it opened until its parent
// closes the control pipe.
class Holder {
 public:
  template <typename Make>
  explicit Holder(Make make) {
    int ready[2];
    int control[2];
    if (pipe(ready) != 0 || pipe(control) != 0) Die("pipe");
    pid_ = fork();
    if (pid_ < 0) Die("fork");
    if (pid_ == 0) {
      prctl(PR_SET_PDEATHSIG, SIGKILL);
      // Only its own pipe ends: a sibling's control pipe held here would keep
      // that sibling from ever seeing the end of it.
      const unsigned low = static_cast<unsigned>(std::min(ready[1], control[0]));
      const unsigned high = static_cast<unsigned>(std::max(ready[1], control[0]));
      close_range(3, low - 1, 0);
      close_range(low + 1, high - 1, 0);
      close_range(high + 1, ~0U, 0);
      RaiseDescriptorLimit();
      make();
      const char byte = 'r';
      if (write(ready[1], &byte, 1) != 1) _exit(1);
      char ignored;
      while (read(control[0], &ignored, 1) > 0) {
      }
      _exit(0);
    }
    close(ready[1]);
    close(control[0]);
    control_ = control[1];
    char byte;
    if (read(ready[0], &byte, 1) != 1) Die("socket holder failed");
    close(ready[0]);
  }
  ~Holder() {
    close(control_);
    waitpid(pid_, nullptr, 0);
  }
  Holder(const Holder&) = delete;
  Holder& operator=(const Holder&) = delete;
  pid_t pid() const { return pid_; }

 private:
  pid_t pid_ = -1;
  int control_ = -1;
};

// The sockets of one size; only one farm exists at a time.
class Farm {
 public:
  Farm(int foreign_sockets, int master_descriptors) {
    master_ = std::make_unique<Holder>([master_descriptors] {
      for (int i = 0; i < master_descriptors; ++i) ListenOn(AF_INET, 0);
    });
    const std::string pid = std::to_string(master_->pid()) + "\n";
    if (!tavow3::base::ReplaceFile(kPidFile, pid, {0, 0, 0644})) Die("write pid file");
    // Both ends of each connection are in the tables.
    int connections = foreign_sockets / 2;
    const int per_child = kSocketsPerChild / 2;
    while (connections > 0) {
      const int count = connections < per_child ? connections : per_child;
      foreign_.push_back(std::make_unique<Holder>([count] {
        Connect(AF_INET, count - count / 4);
        Connect(AF_INET6, count / 4);
      }));
      connections -= count;
    }
  }
  ~Farm() { unlink(kPidFile); }

  static Farm& Get(int foreign_sockets, int master_descriptors) {
    static std::unique_ptr<Farm> farm;
    static std::pair<int, int> size{-1, -1};
    if (size != std::make_pair(foreign_sockets, master_descriptors)) {
      farm.reset();
      farm = std::make_unique<Farm>(foreign_sockets, master_descriptors);
      size = {foreign_sockets, master_descriptors};
    }
    return *farm;
  }

 private:
  std::unique_ptr<Holder> master_;
  std::vector<std::unique_ptr<Holder>> foreign_;
};

// The floor: what the scan reads, read and thrown away, through the same
// wrappers and buffer size.
size_t ReadInputs() {
  size_t bytes = 0;
  std::string pid;
  if (tavow3::base::ReadFile(kPidFile, &pid)) {
    bytes += pid.size();
    std::vector<std::string> links;
    if (tavow3::base::Glob("/proc/" + std::to_string(std::atoi(pid.c_str())) + "/fd/*", &links)) {
      std::string target;
      for (const std::string& link : links) {
        if (tavow3::base::Readlink(link, &target)) bytes += target.size();
      }
    }
  }
  static std::unique_ptr<char[]> buffer(new char[tavow3::TcpTableReader::kBufferSize]);
  for (const char* path : kTables) {
    tavow3::base::UniqueFd fd = tavow3::base::Open(path, O_RDONLY);
    long count;
    while ((count = tavow3::base::ReadSome(fd.get(), buffer.get(),
                                           tavow3::TcpTableReader::kBufferSize)) > 0) {
      bytes += static_cast<size_t>(count);
    }
  }
  return bytes;
}

// The table part of the scan as sscanf would do it (fgets + the format), for
// comparison with the hand-written matcher.
size_t ScanTablesWithSscanf() {
  size_t kept = 0;
  for (const char* path : kTables) {
    FILE* file = std::fopen(path, "r");
    if (file == nullptr) continue;
    char line[1024];
    while (std::fgets(line, sizeof line, file) != nullptr) {
      unsigned short port;
      unsigned int state;
      unsigned long long inode;
      if (std::sscanf(line, tavow3::kTcpTableLineFormat, &port, &state, &inode) == 3) {
        kept += port + state + inode;
      }
    }
    std::fclose(file);
  }
  return kept;
}

void SetLabels(benchmark::State& state) {
  state.SetLabel(std::to_string(state.range(0)) + " foreign sockets, master " +
                 std::to_string(state.range(1)) + " fds");
}

void BM_RuntimeScan(benchmark::State& state) {
  Farm::Get(static_cast<int>(state.range(0)), static_cast<int>(state.range(1)));
  for (auto _ : state) {
    benchmark::DoNotOptimize(tavow3::Engine::IsRuntimeTCPPortConflict(kFreePort));
  }
  SetLabels(state);
}

void BM_Floor(benchmark::State& state) {
  Farm::Get(static_cast<int>(state.range(0)), static_cast<int>(state.range(1)));
  for (auto _ : state) benchmark::DoNotOptimize(ReadInputs());
  SetLabels(state);
}

void BM_TablesWithSscanf(benchmark::State& state) {
  Farm::Get(static_cast<int>(state.range(0)), static_cast<int>(state.range(1)));
  for (auto _ : state) benchmark::DoNotOptimize(ScanTablesWithSscanf());
  SetLabels(state);
}

double ThreadCpuSeconds() {
  timespec now;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

double WallSeconds() {
  return std::chrono::duration<double>(std::chrono::steady_clock::now().time_since_epoch())
      .count();
}

// Scan and floor alternately. The iteration time is the scan's wall time;
// the counters give both ratios scan/floor, of CPU time (user and kernel, the
// reads of /proc included) and of wall time, and the floor's times.
void BM_ScanOverFloor(benchmark::State& state) {
  Farm::Get(static_cast<int>(state.range(0)), static_cast<int>(state.range(1)));
  double scan_cpu = 0, floor_cpu = 0, scan_wall = 0, floor_wall = 0;
  for (auto _ : state) {
    const double cpu0 = ThreadCpuSeconds(), wall0 = WallSeconds();
    benchmark::DoNotOptimize(ReadInputs());
    const double cpu1 = ThreadCpuSeconds(), wall1 = WallSeconds();
    benchmark::DoNotOptimize(tavow3::Engine::IsRuntimeTCPPortConflict(kFreePort));
    const double cpu2 = ThreadCpuSeconds(), wall2 = WallSeconds();
    floor_cpu += cpu1 - cpu0;
    scan_cpu += cpu2 - cpu1;
    floor_wall += wall1 - wall0;
    scan_wall += wall2 - wall1;
    state.SetIterationTime(wall2 - wall1);
  }
  const double n = static_cast<double>(state.iterations());
  state.counters["floor_cpu_ms"] = floor_cpu * 1e3 / n;
  state.counters["scan_cpu_ms"] = scan_cpu * 1e3 / n;
  state.counters["cpu_ratio"] = scan_cpu / floor_cpu;
  state.counters["wall_ratio"] = scan_wall / floor_wall;
  SetLabels(state);
}

}  // namespace

int main(int argc, char** argv) {
  struct stat st;
  if (stat(kSandboxMarker, &st) != 0) {
    std::fprintf(stderr,
                 "port_scan_bench: run inside the sandbox (it writes %s):\n"
                 "  tools/sandbox --root build/sandbox-root -- build/bench/port_scan_bench\n",
                 kPidFile);
    return 2;
  }
  RaiseDescriptorLimit();
  WidenEphemeralPorts();
  benchmark::Initialize(&argc, argv);
  // Sizes in order, so that each farm is built once for all benchmarks of it.
  for (int sockets : {10000, 50000}) {
    for (int fds : {100, 10000}) {
      const std::vector<int64_t> size = {sockets, fds};
      benchmark::RegisterBenchmark("BM_RuntimeScan", BM_RuntimeScan)
          ->Args(size)->Unit(benchmark::kMillisecond);
      benchmark::RegisterBenchmark("BM_Floor", BM_Floor)
          ->Args(size)->Unit(benchmark::kMillisecond);
      benchmark::RegisterBenchmark("BM_ScanOverFloor", BM_ScanOverFloor)
          ->Args(size)->UseManualTime()->Unit(benchmark::kMillisecond);
      benchmark::RegisterBenchmark("BM_TablesWithSscanf", BM_TablesWithSscanf)
          ->Args(size)->Unit(benchmark::kMillisecond);
    }
  }
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  return 0;
}
