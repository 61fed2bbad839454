// The relay service's trusted-proxy list: set, clear, list, and every failure.
#include <tavow3/nginx_conf_manager.h>
#include <tavow3/vantoro_proxy_operators.h>

#include <sys/stat.h>
#include <unistd.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

using Lines = std::vector<std::string>;
namespace fault = base::fault;

constexpr char kDir[] = "/var/tmp/nginx/trusted_proxy";
constexpr char kList[] = "/var/tmp/nginx/trusted_proxy/vantoro.conf";
constexpr char kOldList[] = "set_real_ip_from 198.51.100.1;\n";
constexpr char kSetLine[] = "List of Vantoro servers is set.\n";
constexpr char kEmptyLines[] = "List of Vantoro servers is empty.\nClear the trust list.\n";

struct Outcome {
  int result;
  std::string msg;
};

Outcome RunSet(const Lines& args) {
  NginxConfManager manager(NGINXCONF_SET_VANTORO_PROXY);
  const int result = manager.run_with_args(args);
  return {result, manager.GetMsg()};
}

Outcome RunPlain(NGINXCONF_OPERATOR op) {
  NginxConfManager manager(op);
  const int result = manager.run();
  return {result, manager.GetMsg()};
}

std::string ListFile(const Lines& addresses) {
  std::string text;
  for (const std::string& address : addresses) text += "set_real_ip_from " + address + ";\n";
  return text;
}

// `line` with the six random characters of a temporary's name replaced by
// "TEMP" and, when `expected` names no line ("nginx_deploy:N "), with the
// line number replaced by "N"; GCC's regex breaks the sanitizer build.
std::string Normalised(std::string line, const std::string& expected) {
  const std::string stem = "/vantoro.conf.";
  for (size_t at = line.find(stem); at != std::string::npos; at = line.find(stem, at + 1)) {
    const size_t start = at + stem.size();
    if (line.compare(start, 6, "XXXXXX") != 0 && line.size() >= start + 6) {
      line.replace(start, 6, "TEMP");
    }
  }
  const std::string tag = "nginx_deploy:";
  if (expected.rfind(tag + "N ", 0) == 0 && line.rfind(tag, 0) == 0) {
    const size_t digits_end = line.find(' ', tag.size());
    line.replace(tag.size(), digits_end - tag.size(), "N");
  }
  return line;
}

TEST(NginxConfOperatorSetVantoroProxy, WritesOneLinePerAddressRootOwnedAndNginxReadsIt) {
  const std::vector<Lines> cases = {
      {"192.0.2.1", "fd00::1"},
      {"::ffff:192.0.2.1"},
      {"0.0.0.0", "255.255.255.255", "::", "FD00:0:0::0001"},
      {"2001:db8::1", "192.0.2.1", "2001:db8::1"},  // kept as given, duplicates too
  };
  RemoveTree("/var/tmp/nginx");  // made with its parents
  for (const Lines& addresses : cases) {
    SCOPED_TRACE(addresses.front());
    ClearLog();
    const Outcome set = RunSet(addresses);
    EXPECT_EQ(0, set.result);
    EXPECT_EQ(kSetLine, set.msg);
    EXPECT_EQ(ListFile(addresses), ReadBytes(kList));
    struct stat st;
    ASSERT_EQ(0, ::stat(kList, &st));
    EXPECT_EQ(0u, st.st_uid);
    EXPECT_EQ(0u, st.st_gid);
    EXPECT_EQ(0644u, st.st_mode & 07777);
    EXPECT_EQ(Lines{"vantoro.conf"}, DirNames(kDir));
    EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());

    std::string listed;
    for (const std::string& address : addresses) listed += address + "\n";
    EXPECT_EQ(listed, RunPlain(NGINXCONF_LIST_VANTORO_PROXY).msg);

    // nginx accepts the file as an http-level include.
    WriteBytes("/tmp/realip.conf",
                "pid /tmp/realip.pid;\nerror_log stderr;\nevents {}\n"
                "http { include /var/tmp/nginx/trusted_proxy/*.conf; }\n");
    const RunResult test = RunCommand({"/usr/bin/nginx", "-t", "-c", "/tmp/realip.conf"});
    EXPECT_EQ(0, test.status) << test.err;
  }
  struct stat st;
  ASSERT_EQ(0, ::stat(kDir, &st));
  EXPECT_EQ(0755u, st.st_mode & 07777);
}

TEST(NginxConfOperatorSetVantoroProxy, RefusesAtTheFirstInvalidArgument) {
  const std::vector<std::pair<Lines, std::string>> cases = {
      {{"192.0.2.1", "bad", "worse"}, "bad"},
      {{"192.0.2.0/24"}, "192.0.2.0/24"},
      {{"fd00::/8"}, "fd00::/8"},
      {{"fd00::1", ""}, ""},
      {{" 192.0.2.1"}, " 192.0.2.1"},
      {{"192.0.2.1 "}, "192.0.2.1 "},
      {{"relay.example"}, "relay.example"},
      {{"localhost"}, "localhost"},
      {{"256.1.1.1"}, "256.1.1.1"},
      {{"1.2.3"}, "1.2.3"},
      {{"01.2.3.4"}, "01.2.3.4"},
      {{"fe80::1%lo"}, "fe80::1%lo"},
      {{"192.0.2.1;"}, "192.0.2.1;"},
      {{"1.2.3.4\n5.6.7.8"}, "1.2.3.4\n5.6.7.8"},
  };
  WriteBytes(kList, kOldList);
  for (const auto& [args, bad] : cases) {
    SCOPED_TRACE(bad);
    ClearLog();
    const Outcome set = RunSet(args);
    EXPECT_EQ(-1, set.result);
    EXPECT_EQ(bad + " is an invalid IP\n", set.msg);
    EXPECT_EQ(kOldList, ReadBytes(kList));
    EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());
  }

  // A refused list leaves the one set before in place.
  NginxConfOperatorSetVantoroProxy op;
  EXPECT_TRUE(op.set_args({"192.0.2.9"}));
  EXPECT_FALSE(op.set_args({"192.0.2.10", "bad"}));
  EXPECT_EQ(0, op.run());
  EXPECT_EQ(std::string("bad is an invalid IP\n") + kSetLine, op.GetMsg());
  EXPECT_EQ("set_real_ip_from 192.0.2.9;\n", ReadBytes(kList));

  // An empty list replaces the stored one too.
  EXPECT_TRUE(op.set_args({}));
  EXPECT_EQ(0, op.run());
  EXPECT_FALSE(PathExists(kList));
}

TEST(NginxConfOperatorSetVantoroProxy, AnEmptyListDeletesTheFile) {
  WriteBytes("/tmp/target.conf", kOldList);
  for (const char* state : {"file", "missing", "link"}) {
    SCOPED_TRACE(state);
    RemoveTree(kList);
    if (std::string(state) == "file") WriteBytes(kList, kOldList);
    if (std::string(state) == "link") {
      ASSERT_EQ(0, ::symlink("/tmp/target.conf", kList));
    }
    const Outcome set = RunSet({});
    EXPECT_EQ(0, set.result);
    EXPECT_EQ(kEmptyLines, set.msg);
    EXPECT_FALSE(PathExists(kList));
  }
  EXPECT_EQ(kOldList, ReadBytes("/tmp/target.conf"));

  WriteBytes(std::string(kList) + "/keep", "");  // a directory cannot be unlinked
  ClearLog();
  const Outcome failed = RunPlain(NGINXCONF_SET_VANTORO_PROXY);
  EXPECT_EQ(-1, failed.result);
  EXPECT_EQ("", failed.msg);
  EXPECT_EQ(Lines{"nginx_deploy:1071 Cannot delete /var/tmp/nginx/trusted_proxy/vantoro.conf "
                  "Is a directory"},
            TaggedLogMessages("nginx_deploy"));
}

TEST(NginxConfOperatorSetVantoroProxy, ThousandsOfAddressesRoundTrip) {
  Lines addresses;
  for (int i = 0; i < 5000; ++i) {
    addresses.push_back(i % 5 == 0 ? "2001:db8::" + std::to_string(i)
                                   : "10." + std::to_string(i / 256) + "." +
                                         std::to_string(i % 256) + ".1");
  }
  EXPECT_EQ(0, RunSet(addresses).result);
  EXPECT_EQ(ListFile(addresses), ReadBytes(kList));
  std::string listed;
  for (const std::string& address : addresses) listed += address + "\n";
  EXPECT_EQ(listed, RunPlain(NGINXCONF_LIST_VANTORO_PROXY).msg);
}

TEST(NginxConfOperatorSetVantoroProxy, UnusableDirectoryIsLogged) {
  RemoveTree(kDir);
  WriteBytes(kDir, "not a directory");
  ClearLog();
  const Outcome set = RunSet({"192.0.2.1"});
  EXPECT_EQ(-1, set.result);
  EXPECT_EQ("", set.msg);
  EXPECT_EQ(Lines{"nginx_deploy:1060 TAVOFSMkdirP failed (/var/tmp/nginx/trusted_proxy, "
                  "Not a directory)"},
            TaggedLogMessages("nginx_deploy"));
}

struct FaultCase {
  fault::Op op;
  int nth;      // the nth call of that operation fails
  int result;
  std::string log;  // the one line (Normalised), "" for none
};

TEST(NginxConfOperatorSetVantoroProxy, FailureAtEachFileCallIsLoggedAndLeavesNoTemporary) {
  const std::string temp = "/var/tmp/nginx/trusted_proxy/vantoro.conf.TEMP";
  const std::string io = ", Input/output error";
  const std::vector<FaultCase> cases = {
      {fault::Op::kMkstemp, 1, -1,
       "nginx_deploy:1088 Fail to create temp file "
       "(/var/tmp/nginx/trusted_proxy/vantoro.conf.XXXXXX" + io + ")"},
      {fault::Op::kOpen, 1, -1, "nginx_deploy:1093 Fail to fopen file (" + temp + io + ")"},
      {fault::Op::kWrite, 1, -1, "nginx_deploy:N Fail to write file (" + temp + io + ")"},
      {fault::Op::kFsync, 1, -1, "nginx_deploy:N Fail to write file (" + temp + io + ")"},
      {fault::Op::kChown, 1, -1, "nginx_deploy:1101 Fail to chown file (" + temp + io + ")"},
      {fault::Op::kChmod, 1, -1, "nginx_deploy:1106 Fail to chmod file (" + temp + io + ")"},
      {fault::Op::kClose, 1, 0, ""},  // the descriptor of mkstemp, unused
      {fault::Op::kClose, 2, -1, "nginx_deploy:N Fail to write file (" + temp + io + ")"},
      {fault::Op::kRename, 1, -1,
       "nginx_deploy:1111 Fail to rename file from " + temp +
           " to /var/tmp/nginx/trusted_proxy/vantoro.conf" + io},
      {fault::Op::kUnlink, 1, 0, "nginx_deploy:1120 Fail to remove temp file " + temp + io},
  };
  for (const FaultCase& c : cases) {
    SCOPED_TRACE(testing::Message() << "op " << static_cast<int>(c.op) << ", call " << c.nth);
    WriteBytes(kList, kOldList);
    ClearLog();
    Outcome set;
    {
      fault::Arm arm(c.nth, fault::kOnce, EIO, c.op);
      set = RunSet({"192.0.2.1"});
      EXPECT_TRUE(arm.fired());
    }
    EXPECT_EQ(c.result, set.result);
    EXPECT_EQ(c.result == 0 ? kSetLine : "", set.msg);
    EXPECT_EQ(c.result == 0 ? "set_real_ip_from 192.0.2.1;\n" : kOldList, ReadBytes(kList));
    EXPECT_EQ(Lines{"vantoro.conf"}, DirNames(kDir));
    Lines log = TaggedLogMessages("nginx_deploy");
    for (std::string& line : log) line = Normalised(line, c.log);
    EXPECT_EQ(c.log.empty() ? Lines{} : Lines{c.log}, log);
  }
}

TEST(NginxConfOperatorSetVantoroProxy, FaultLoopKeepsTheListWholeAndRemovesTheTemporary) {
  for (fault::Mode mode : {fault::kOnce, fault::kPersistent}) {
    int n = 1;
    for (;; ++n) {
      SCOPED_TRACE(testing::Message() << "mode " << mode << ", call " << n);
      WriteBytes(kList, kOldList);
      fault::Arm arm(n, mode, EIO);
      const int result = RunSet({"192.0.2.1", "fd00::1"}).result;
      if (!arm.fired()) {
        EXPECT_EQ(0, result);
        break;
      }
      const std::string bytes = ReadBytes(kList);
      if (result == 0) {
        EXPECT_EQ("set_real_ip_from 192.0.2.1;\nset_real_ip_from fd00::1;\n", bytes);
      } else {
        EXPECT_EQ(-1, result);
        EXPECT_EQ(kOldList, bytes);
      }
      if (mode == fault::kOnce) {
        EXPECT_EQ(Lines{"vantoro.conf"}, DirNames(kDir));
      }
      RemoveTree(kDir);  // a persistent fault may leave its temporary
    }
    // mkstemp, close, open, write, fsync, chown, chmod, close, rename, unlink
    EXPECT_GE(n - 1, 10);
  }
}

TEST(NginxConfOperatorClearVantoroProxy, DeletesTheFileOrTheLinkOnly) {
  WriteBytes("/tmp/target.conf", kOldList);
  for (const char* state : {"file", "missing", "link", "dangling link"}) {
    SCOPED_TRACE(state);
    RemoveTree(kList);
    const std::string s = state;
    if (s == "file") WriteBytes(kList, kOldList);
    if (s == "link") {
      ASSERT_EQ(0, ::symlink("/tmp/target.conf", kList));
    }
    if (s == "dangling link") {
      ASSERT_EQ(0, ::symlink("/nonexistent", kList));
    }
    ClearLog();
    const Outcome clear = RunPlain(NGINXCONF_CLEAR_VANTORO_PROXY);
    EXPECT_EQ(0, clear.result);
    EXPECT_EQ("Trust list of Vantoro servers is cleared.\n", clear.msg);
    EXPECT_FALSE(PathExists(kList));
    EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());
  }
  EXPECT_EQ(kOldList, ReadBytes("/tmp/target.conf"));

  WriteBytes(std::string(kList) + "/keep", "");
  ClearLog();
  const Outcome failed = RunPlain(NGINXCONF_CLEAR_VANTORO_PROXY);
  EXPECT_EQ(-1, failed.result);
  EXPECT_EQ("", failed.msg);
  EXPECT_EQ(Lines{"nginx_deploy:1146 Cannot delete link "
                  "/var/tmp/nginx/trusted_proxy/vantoro.conf Is a directory"},
            TaggedLogMessages("nginx_deploy"));
}

TEST(NginxConfOperatorListVantoroProxy, TakesTheWordAfterEachDirective) {
  const std::vector<std::pair<const char*, const char*>> cases = {
      {nullptr, ""},
      {"set_real_ip_from 192.0.2.1;\nset_real_ip_from fd00::1;\n", "192.0.2.1\nfd00::1\n"},
      {"set_real_ip_from 192.0.2.1 ;\n", "192.0.2.\n"},
      {"# relays\n\tset_real_ip_from\t10.0.0.1;  set_real_ip_from 10.0.0.2;", "10.0.0.1\n10.0.0.2\n"},
      {"real_ip_header X-Forwarded-For;\n", ""},
      {"set_real_ip_from", ""},
      {"set_real_ip_from ;\n", "\n"},
      {"set_real_ip_from set_real_ip_from 192.0.2.1;", "set_real_ip_fro\n192.0.2.1\n"},
      {"SET_REAL_IP_FROM 192.0.2.1;", ""},
      {"", ""},
  };
  for (const auto& [content, listed] : cases) {
    SCOPED_TRACE(content == nullptr ? "<missing>" : content);
    RemoveTree(kList);
    if (content != nullptr) WriteBytes(kList, content);
    const Outcome list = RunPlain(NGINXCONF_LIST_VANTORO_PROXY);
    EXPECT_EQ(0, list.result);
    EXPECT_EQ(listed, list.msg);
  }
}

TEST(NginxConfOperatorListVantoroProxy, UnreadableFileIsLogged) {
  WriteBytes(kList, kOldList);
  ClearLog();
  {
    fault::Arm arm(1, fault::kOnce, EACCES, fault::Op::kOpen);
    const Outcome list = RunPlain(NGINXCONF_LIST_VANTORO_PROXY);
    EXPECT_EQ(-1, list.result);
    EXPECT_EQ("", list.msg);
  }
  EXPECT_EQ(Lines{"nginx_deploy:1163 Failed to open /var/tmp/nginx/trusted_proxy/vantoro.conf "
                  "Permission denied"},
            TaggedLogMessages("nginx_deploy"));

  RemoveTree(kList);
  WriteBytes(std::string(kList) + "/keep", "");  // opens, but reads fail
  ClearLog();
  const Outcome list = RunPlain(NGINXCONF_LIST_VANTORO_PROXY);
  EXPECT_EQ(-1, list.result);
  EXPECT_EQ("", list.msg);
  const std::string expected =
      "nginx_deploy:N Failed to read /var/tmp/nginx/trusted_proxy/vantoro.conf Is a directory";
  Lines log = TaggedLogMessages("nginx_deploy");
  for (std::string& line : log) line = Normalised(line, expected);
  EXPECT_EQ(Lines{expected}, log);
}

}  // namespace
}  // namespace tavow3::test
