// The run-once load cycle: callbacks, re-entry, threads.
#include <tavow3/engine.h>

#include <gtest/gtest.h>

#include <atomic>
#include <boost/function.hpp>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include <tavow3/resource.h>

#include "engine/engine_private.h"

namespace tavow3 {
namespace {

FQDNPortSchemaResource Record(const std::string& fqdn, unsigned short port) {
  return FQDNPortSchemaResource(fqdn, port, FQDNPortSchemaResource::HTTP, "", "", "", "", 0,
                                "tavow3");
}

// The records that the built-in registrations put into a new engine (the
// library's own services declare their stored ports).
size_t BuiltinRecords() {
  Engine engine;
  engine.load();
  return engine.impl().fqdn_resources.size();
}

uint32_t ThisThreadHash() {
  return static_cast<uint32_t>(std::hash<std::thread::id>{}(std::this_thread::get_id()));
}

TEST(EngineLoad, NewEngineStartsEmptyWithElevenBuckets) {
  Engine engine;
  Engine::Private& d = engine.impl();
  EXPECT_EQ(0u, d.load_state.load());
  EXPECT_EQ(0u, d.loader_thread);
  EXPECT_EQ(11u, d.port_schemas.bucket_count());
  EXPECT_EQ(11u, d.fqdn_resources.bucket_count());
  EXPECT_EQ(11u, d.names.bucket_count());
  EXPECT_EQ(1.0f, d.port_schemas.max_load_factor());
  EXPECT_EQ(1.0f, d.fqdn_resources.max_load_factor());
  EXPECT_EQ(1.0f, d.names.max_load_factor());
  EXPECT_TRUE(d.port_schemas.empty() && d.fqdn_resources.empty() && d.names.empty());
}

// Callbacks run in the order they were added, once per private part; copies
// share it, a new engine runs them again.
TEST(EngineLoad, RunsAddedCallbacksOncePerEngineInOrder) {
  static std::vector<std::string> calls;
  Engine::Register([](Engine&) { calls.push_back("first"); });
  Engine::Register([](Engine&) { calls.push_back("second"); });

  Engine engine;
  Engine copy = engine;
  engine.load();
  engine.load();
  copy.load();
  EXPECT_EQ((std::vector<std::string>{"first", "second"}), calls);
  EXPECT_EQ(2u, copy.impl().load_state.load());
  EXPECT_EQ(ThisThreadHash(), engine.impl().loader_thread);

  Engine fresh;
  fresh.load();
  EXPECT_EQ((std::vector<std::string>{"first", "second", "first", "second"}), calls);
}

// A callback that loads a copy of the engine returns at once and sees what
// was registered so far; registering through the copy fills the shared registry.
TEST(EngineLoad, ReentryFromACallbackReturnsAtOnce) {
  const size_t builtin = BuiltinRecords();
  static std::vector<size_t> seen;
  static int runs = 0;
  Engine::Register([](Engine& engine) {
    ++runs;
    Engine copy = engine;
    EXPECT_TRUE(RegisterFQDNPortSchemaResource(copy, Record("one", 7001)));
    seen.push_back(copy.impl().fqdn_resources.size());
  });
  Engine::Register([](Engine& engine) {
    Engine copy = engine;
    copy.load();
    seen.push_back(copy.impl().fqdn_resources.size());
    EXPECT_EQ(1u, copy.impl().load_state.load());
    EXPECT_TRUE(RegisterFQDNPortSchemaResource(copy, Record("two", 7002)));
  });
  Engine engine;
  engine.load();
  EXPECT_EQ(1, runs);
  EXPECT_EQ((std::vector<size_t>{builtin + 1, builtin + 1}), seen);
  EXPECT_EQ(builtin + 2, engine.impl().fqdn_resources.size());
  EXPECT_EQ(2u, engine.impl().load_state.load());
}

// Many threads load one engine at once: one of them runs the callbacks, the
// others wait and find the registry complete when load() returns.
TEST(EngineLoad, ThreadsRacingOnTheFirstLoad) {
  constexpr int kThreads = 12;
  constexpr int kRecords = 25;
  const size_t builtin = BuiltinRecords();
  static std::atomic<int> runs{0};
  static std::atomic<int> started{0};
  static std::atomic<uint32_t> runner{0};
  Engine::Register([](Engine& engine) {
    ++runs;
    runner = ThisThreadHash();
    // Let every thread reach load() before the registry fills.
    while (started.load() < kThreads) std::this_thread::yield();
    for (int i = 0; i < kRecords; ++i) {
      EXPECT_TRUE(RegisterFQDNPortSchemaResource(
          engine, Record("host" + std::to_string(i), static_cast<unsigned short>(7100 + i))));
    }
  });
  for (int round = 0; round < 20; ++round) {
    SCOPED_TRACE(round);
    started = 0;
    Engine engine;
    std::vector<size_t> sizes(kThreads);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
      threads.emplace_back([&engine, &sizes, t] {
        Engine mine = engine;
        ++started;
        mine.load();
        sizes[t] = mine.impl().fqdn_resources.size();
      });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(round + 1, runs.load());
    EXPECT_EQ(std::vector<size_t>(kThreads, builtin + kRecords), sizes);
    EXPECT_EQ(runner.load(), engine.impl().loader_thread);
  }
}

// An empty callable raises the function library's error and leaves the
// engine in the loading state.
TEST(EngineLoad, EmptyCallablePassesTheErrorOn) {
  Engine engine;
  EXPECT_THROW(engine.load_callback(boost::function<void()>()), boost::bad_function_call);
  EXPECT_EQ(1u, engine.impl().load_state.load());

  Engine::Register(boost::function<void(Engine&)>());
  Engine other;
  EXPECT_THROW(other.load(), boost::bad_function_call);
  EXPECT_EQ(1u, other.impl().load_state.load());
}

}  // namespace
}  // namespace tavow3
