// A program outside the project that uses the installed library.
#include <tavow3/tavow3.h>

#include <cstdio>

int main() {
  // Port 0 is never in use, so a working library answers false.
  bool conflict = tavow3::Engine::IsRuntimeTCPPortConflict(0);
  std::printf("tavow3 consumer: port 0 %s\n", conflict ? "in use" : "free");
  return conflict ? 1 : 0;
}
