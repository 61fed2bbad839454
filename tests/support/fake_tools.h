// The appliance's own tools are fakes in the sandbox: each records its
// argument vector as one JSON array per line and exits with the status that
// a test set. Fakes installed: /usr/tavo/bin/tavocrtregister,
// tavocrtunregister, tavozamnotify, tavofirewall, tavouserhome and tavopkgctl.
#ifndef TAVOW3_TESTS_SUPPORT_FAKE_TOOLS_H_
#define TAVOW3_TESTS_SUPPORT_FAKE_TOOLS_H_

#include <string>
#include <vector>

namespace tavow3::test {

// Argument vectors (without argv[0]) of every run of the fake `tool` (its
// file name, "tavocrtregister"), oldest first.
std::vector<std::vector<std::string>> FakeCalls(const std::string& tool);

// Makes every later run of `tool` exit with `status` (0 restores success).
void SetFakeExit(const std::string& tool, int status);

// Forgets the recorded runs of `tool`.
void ClearFakeCalls(const std::string& tool);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_SUPPORT_FAKE_TOOLS_H_
