// The web-hosting package's library: loaded by the first load cycle that
// finds the package enabled, once per process, kept loaded.
#include <dlfcn.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include <tavow3/engine.h>

#include "base/fault.h"
#include "engine/engine_private.h"
#include "sockets.h"
#include "support/syslog_capture.h"

namespace tavow3 {
namespace {

constexpr char kLibrary[] = "/var/packages/Pagora/target/lib/libtavopagora.so";
constexpr char kEnabled[] = "/var/packages/Pagora/enabled";
constexpr char kFailurePrefix[] = "engine:62 Failed to load tavopagora lib, ";

std::string FileBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  std::ostringstream bytes;
  bytes << in.rdbuf();
  return bytes.str();
}

void InstallLibrary() { test::WriteTestFile(kLibrary, FileBytes(TAVOW3_TEST_PLUGIN)); }
void InstallGarbage() { test::WriteTestFile(kLibrary, "not a shared object\n"); }
void Enable(bool enabled) {
  if (enabled) {
    test::WriteTestFile(kEnabled, "");
  } else {
    unlink(kEnabled);
  }
}

// The host names of the records that the plug-in's callback registered in a
// new, loaded engine (the built-in registrations add records for any host).
std::vector<std::string> PluginRecordsOfNewEngine() {
  Engine engine;
  engine.load();
  std::vector<std::string> names;
  for (const auto& entry : engine.impl().fqdn_resources) {
    if (!entry.first.first.empty()) names.push_back(entry.first.first);
  }
  std::sort(names.begin(), names.end());
  return names;
}

bool LibraryMapped() {
  std::ifstream maps("/proc/self/maps");
  for (std::string line; std::getline(maps, line);) {
    if (line.find(kLibrary) != std::string::npos) return true;
  }
  return false;
}

std::vector<std::string> LoadFailures() {
  std::vector<std::string> failures;
  for (const std::string& line : test::LogMessages()) {
    if (line.rfind("engine:62 ", 0) == 0) failures.push_back(line);
  }
  return failures;
}

using Names = std::vector<std::string>;

TEST(PackagePlugin, LoadedOnceWhileEnabled) {
  InstallLibrary();
  Enable(true);
  EXPECT_EQ(Names{"plugin1"}, PluginRecordsOfNewEngine());
  EXPECT_TRUE(LibraryMapped());
  EXPECT_EQ(1u, AddedCallbacks().size());
  // Each new engine runs the callback; the library is not loaded again, which
  // would have added a second one.
  EXPECT_EQ(Names{"plugin2"}, PluginRecordsOfNewEngine());
  EXPECT_EQ(1u, AddedCallbacks().size());
  // The loader is not asked again, whatever is on disk.
  InstallGarbage();
  base::fault::Arm arm(1, base::fault::kPersistent, ENOENT, base::fault::Op::kDlopen);
  EXPECT_EQ(Names{"plugin3"}, PluginRecordsOfNewEngine());
  EXPECT_FALSE(arm.fired());
  EXPECT_EQ(Names{}, LoadFailures());
}

TEST(PackagePlugin, TriedAgainWhileNotEnabled) {
  InstallLibrary();
  Enable(false);
  {
    base::fault::Arm arm(1, base::fault::kPersistent, ENOENT, base::fault::Op::kDlopen);
    EXPECT_EQ(Names{}, PluginRecordsOfNewEngine());
    EXPECT_EQ(Names{}, PluginRecordsOfNewEngine());
    EXPECT_FALSE(arm.fired());
  }
  EXPECT_FALSE(LibraryMapped());
  EXPECT_TRUE(AddedCallbacks().empty());
  Enable(true);
  EXPECT_EQ(Names{"plugin1"}, PluginRecordsOfNewEngine());
  EXPECT_TRUE(LibraryMapped());
  // Disabled later: the library and its callback stay for the process.
  Enable(false);
  EXPECT_EQ(Names{"plugin2"}, PluginRecordsOfNewEngine());
}

// A library that does not load is logged with the loader's message, once;
// the load cycle goes on, and the library is not tried again.
void ExpectOneLoggedFailure() {
  static bool ran = false;
  Engine::Register([](Engine&) { ran = true; });
  Enable(true);
  test::ClearLog();
  EXPECT_EQ(Names{}, PluginRecordsOfNewEngine());
  EXPECT_TRUE(ran);
  // The loader's own words for the same file.
  ASSERT_EQ(nullptr, dlopen(kLibrary, RTLD_LAZY));
  const char* error = dlerror();
  ASSERT_NE(nullptr, error);
  const Names expected{std::string(kFailurePrefix) + error};
  EXPECT_EQ(expected, LoadFailures());

  InstallLibrary();
  EXPECT_EQ(Names{}, PluginRecordsOfNewEngine());
  EXPECT_EQ(expected, LoadFailures());
  EXPECT_FALSE(LibraryMapped());
}

TEST(PackagePlugin, NotASharedObjectIsLoggedOnce) {
  InstallGarbage();
  ExpectOneLoggedFailure();
}

TEST(PackagePlugin, MissingLibraryIsLoggedOnce) {
  test::WriteTestFile("/var/packages/Pagora/target/lib/placeholder", "");
  unlink(kLibrary);
  ExpectOneLoggedFailure();
}

}  // namespace
}  // namespace tavow3
