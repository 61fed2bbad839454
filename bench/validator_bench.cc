// Throughput of the address and host-name checks, beside the C library's
// address parser and a bare UTS #46 conversion as floors.
#include <arpa/inet.h>
#include <benchmark/benchmark.h>
#include <tavow3/validator.h>

#include <string>
#include <vector>

namespace {

const std::vector<std::string> kAddresses = {
    "192.168.1.0/24",   "10.0.0.1",       "2001:db8:85a3:0:0:8a2e:370:7334/64",
    "fe80::1",          "::ffff:1.2.3.4", "1:2:3:4:5:6:7::",
    "256.1.1.1",        "fe80::1%eth0",   "1:2:3:4:5:6:7:8:9",
};

const std::vector<std::string> kNames = {
    "nas", "portal.box1.example.com", "b\xc3\xbc" "cher.example", "a..b",
    std::string(63, 'a') + "." + std::string(63, 'b') + "." + std::string(63, 'c'),
};

void BM_IsCIDRValid(benchmark::State& state) {
  for (auto _ : state) {
    for (const std::string& address : kAddresses) {
      benchmark::DoNotOptimize(tavow3::Validator::IsCIDRValid(address));
    }
  }
  state.SetItemsProcessed(state.iterations() * kAddresses.size());
}
BENCHMARK(BM_IsCIDRValid);

// Floor: the C library's parser on the same addresses (no prefix lengths).
void BM_InetPton(benchmark::State& state) {
  std::vector<std::string> bare;
  for (const std::string& address : kAddresses) bare.push_back(address.substr(0, address.find('/')));
  unsigned char buffer[16];
  for (auto _ : state) {
    for (const std::string& address : bare) {
      benchmark::DoNotOptimize(inet_pton(AF_INET6, address.c_str(), buffer) == 1 ||
                               inet_pton(AF_INET, address.c_str(), buffer) == 1);
    }
  }
  state.SetItemsProcessed(state.iterations() * bare.size());
}
BENCHMARK(BM_InetPton);

void BM_IsSerNameValid(benchmark::State& state) {
  for (auto _ : state) {
    for (const std::string& name : kNames) {
      benchmark::DoNotOptimize(tavow3::Validator::IsSerNameValid(name));
    }
  }
  state.SetItemsProcessed(state.iterations() * kNames.size());
}
BENCHMARK(BM_IsSerNameValid);

// Floor: the conversion alone, which IsSerNameValid runs first.
void BM_UTF8ToPunycode(benchmark::State& state) {
  for (auto _ : state) {
    for (const std::string& name : kNames) {
      std::string ascii;
      benchmark::DoNotOptimize(tavow3::Validator::UTF8ToPunycode(name, ascii));
    }
  }
  state.SetItemsProcessed(state.iterations() * kNames.size());
}
BENCHMARK(BM_UTF8ToPunycode);

}  // namespace

BENCHMARK_MAIN();
