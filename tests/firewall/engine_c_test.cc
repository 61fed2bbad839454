// The engine's C interface, called from C, and its exported names.
#include <dlfcn.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include <gtest/gtest.h>
#include <tavow3/engine_c.h>

#include "engine/engine_private.h"
#include "engine_c_calls.h"
#include "support/test_engine.h"
#include "support/test_files.h"

namespace tavow3::test {
namespace {

constexpr char kSystemFile[] = "/usr/tavo/etc/services.d/tavow3.sc";
constexpr char kSystemBackup[] = "/var/tmp/tavow3/tavow3.sc";

int callback_runs = 0;

void CountingCallback(Engine& engine) {
  ++callback_runs;
  Register(engine, 8081, FQDNPortSchemaResource::HTTP, "tavow3");
}

bool HoldsLockFile() {
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    std::error_code error;
    if (std::filesystem::read_symlink(entry.path(), error) == "/run/lock/tavow3.lock") return true;
  }
  return false;
}

TEST(EngineC, HandleLoadsOnceAndGeneratesEachTime) {
  Engine::Register(CountingCallback);
  CReleaseNull();
  int results[2] = {-1, -1};
  CRegenTwice(results);
  EXPECT_EQ(1, results[0]);
  EXPECT_EQ(1, results[1]);
  EXPECT_EQ(1, callback_runs);
  // The second run saved the file that the first installed.
  EXPECT_EQ(ReadBytes(kSystemFile), ReadBytes(kSystemBackup));
  EXPECT_NE(std::string::npos, ReadBytes(kSystemFile).find("ports=\"8081\""));

  EXPECT_EQ(1, CRegenTemporary());
  EXPECT_EQ(1, CRegenTemporary());
  EXPECT_EQ(3, callback_runs) << "every temporary engine loads anew";
}

TEST(EngineC, ReleaseClosesTheLockFile) {
  void* engine = TAVOW3_Engine_Initialize();
  ASSERT_NE(nullptr, engine);
  EXPECT_TRUE(HoldsLockFile());
  TAVOW3_Engine_Release(engine);
  EXPECT_FALSE(HoldsLockFile());
}

TEST(EngineC, OwnerWithoutResourcesDeletesInstalledFile) {
  WriteBytes(kSystemFile, "[old]\n");
  void* engine = TAVOW3_Engine_Initialize();
  static_cast<Engine*>(engine)->impl().load_state = 2;  // no registration callbacks
  EXPECT_EQ(1, TAVOW3_Engine_RegenAll(engine));
  TAVOW3_Engine_Release(engine);
  EXPECT_FALSE(PathExists(kSystemFile));
}

TEST(EngineC, EveryNameIsExportedUnmangled) {
  void* library = ::dlopen(TAVOW3_LIBRARY_PATH, RTLD_NOW | RTLD_LOCAL);
  ASSERT_NE(nullptr, library) << ::dlerror();
  for (const char* name : {"TAVOW3_Engine_Initialize", "TAVOW3_Engine_Release",
                           "TAVOW3_Engine_RegenAll", "TAVOW3_Fw_RegenAll"}) {
    EXPECT_NE(nullptr, ::dlsym(library, name)) << name;
  }
  ::dlclose(library);
}

}  // namespace
}  // namespace tavow3::test
