// Engine::IsRuntimeTCPPortConflict on real loopback sockets in the sandbox's
// network namespace, with a child process standing in for the web server.
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include <tavow3/engine.h>

#include "engine/runtime_port_scan.h"
#include "sockets.h"
#include "support/syslog_capture.h"

namespace tavow3 {
namespace {

using test::BoundSocket;
using test::Connect;
using test::Connection;
using test::Listen;
using test::LocalPortStates;
using test::SocketHolder;
using test::WaitForState;

constexpr unsigned kTimeWait = 6;
constexpr unsigned kCloseWait = 8;

std::string ConflictLine(unsigned short port) {
  return "engine:317 Runtime port " + std::to_string(port) + " conflict for nginx";
}

bool Contains(const std::vector<unsigned>& states, unsigned state) {
  return std::find(states.begin(), states.end(), state) != states.end();
}

// A foreign process holds a port while a socket on it is listening, connected
// or connecting; a socket on its way out (TIME_WAIT, CLOSE_WAIT) does not.
TEST(RuntimePortConflict, ForeignSocketsByState) {
  for (int family : {AF_INET, AF_INET6}) {
    SCOPED_TRACE(family == AF_INET ? "IPv4" : "IPv6");
    test::ClearLog();

    BoundSocket listener = Listen(family, 0);
    BoundSocket v6_only = Listen(AF_INET6, 0, test::kV6Only);
    Connection established = Connect(family, listener);

    // TIME_WAIT on the client's port: the client closes first.
    BoundSocket closing_listener = Listen(family, 0);
    Connection closed = Connect(family, closing_listener);
    const unsigned short time_wait_port = closed.client.port;
    closed.client.fd.Reset();
    closed.server.fd.Reset();
    WaitForState(time_wait_port, kTimeWait);

    // CLOSE_WAIT on the listener's port: the peer closed, the accepted socket
    // stays open, the listener is gone.
    BoundSocket half_listener = Listen(family, 0);
    Connection half = Connect(family, half_listener);
    const unsigned short close_wait_port = half_listener.port;
    half_listener.fd.Reset();
    half.client.fd.Reset();
    WaitForState(close_wait_port, kCloseWait);

    // Nothing but the closing sockets holds these ports.
    ASSERT_EQ(std::vector<unsigned>{kTimeWait}, LocalPortStates(time_wait_port));
    ASSERT_EQ(std::vector<unsigned>{kCloseWait}, LocalPortStates(close_wait_port));
    ASSERT_TRUE(Contains(LocalPortStates(established.client.port), 1));

    struct Case {
      const char* what;
      unsigned short port;
      bool conflict;
    };
    const Case cases[] = {
        {"listening", listener.port, true},
        {"IPv6-only listener", v6_only.port, true},
        {"established, outgoing local port", established.client.port, true},
        {"TIME_WAIT", time_wait_port, false},
        {"CLOSE_WAIT", close_wait_port, false},
    };
    std::vector<std::string> expected_log;
    for (const Case& c : cases) {
      SCOPED_TRACE(c.what);
      EXPECT_EQ(c.conflict, Engine::IsRuntimeTCPPortConflict(c.port));
      if (c.conflict) expected_log.push_back(ConflictLine(c.port));
    }
    EXPECT_EQ(expected_log, test::LogMessages());
  }
}

// The web server's own sockets never conflict: listening on IPv4 and IPv6
// only, connected, and a port it shares through SO_REUSEPORT with a foreign
// listener. Without a usable pid file they all count as foreign.
TEST(RuntimePortConflict, WebServerSocketsByPidFile) {
  SocketHolder web_server({
      {AF_INET, test::kNoFlags, 0, false},
      {AF_INET6, test::kV6Only, 0, false},
      {AF_INET, test::kNoFlags, 0, true},
      {AF_INET, test::kReusePort, 0, false},
  });
  const std::vector<unsigned short>& web = web_server.ports();
  BoundSocket shared = Listen(AF_INET, web[3], test::kReusePort);
  BoundSocket foreign = Listen(AF_INET6, 0);
  const std::string pid = std::to_string(web_server.pid());

  struct Case {
    bool has_file;
    std::string content;
    bool web_ports_conflict;
  };
  const Case cases[] = {
      {false, "", true},
      {true, pid, false},
      {true, " \n" + pid + "\n", false},
      {true, "+" + pid + " trailing", false},
      {true, "", true},
      {true, "nginx\n", true},
      {true, "-" + pid, true},
      {true, "2147483647", true},  // no such process
      {true, "0", true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.has_file ? "[" + c.content + "]" : "<none>");
    if (c.has_file) {
      test::WriteTestFile("/run/nginx.pid", c.content);
    } else {
      unlink("/run/nginx.pid");
    }
    for (unsigned short port : web) {
      SCOPED_TRACE(port);
      EXPECT_EQ(c.web_ports_conflict, Engine::IsRuntimeTCPPortConflict(port));
    }
    EXPECT_TRUE(Engine::IsRuntimeTCPPortConflict(foreign.port));
    const std::vector<unsigned short> found = CollectForeignTCPPorts();
    EXPECT_TRUE(std::is_sorted(found.begin(), found.end()));
    EXPECT_TRUE(std::binary_search(found.begin(), found.end(), foreign.port));
  }
}

// Port 443 with "/run/ngx_port_443" holding 1 or 2 is the web server's, even
// while another process listens on it; other contents fall through to the scan.
TEST(RuntimePortConflict, Port443OwnerFile) {
  BoundSocket https = Listen(AF_INET, 443);
  BoundSocket other = Listen(AF_INET, 0);
  struct Case {
    const char* content;  // nullptr: no file
    bool conflict;
  };
  const Case cases[] = {
      {nullptr, true}, {"1", false},   {"2\n", false}, {" 2", false},  {"1junk", false},
      {"0", true},     {"3", true},    {"-1", true},   {"", true},     {"one", true},
      {"12", true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.content == nullptr ? "<none>" : "[" + std::string(c.content) + "]");
    test::ClearLog();
    if (c.content == nullptr) {
      unlink("/run/ngx_port_443");
    } else {
      test::WriteTestFile("/run/ngx_port_443", c.content);
    }
    EXPECT_EQ(c.conflict, Engine::IsRuntimeTCPPortConflict(443));
    // The file speaks for port 443 only.
    EXPECT_TRUE(Engine::IsRuntimeTCPPortConflict(other.port));
    std::vector<std::string> expected;
    if (c.conflict) expected.push_back(ConflictLine(443));
    expected.push_back(ConflictLine(other.port));
    EXPECT_EQ(expected, test::LogMessages());
  }
}

TEST(RuntimePortConflict, SocketLinkTargets) {
  struct Case {
    const char* target;
    bool is_socket;
    unsigned long long inode;
  };
  const Case cases[] = {
      {"socket:[12345]", true, 12345},
      {"socket:[0x10]", true, 16},  // strtol with base 0
      {"socket:[010]", true, 8},
      {"socket:[12345", false, 0},
      {"socket:[12345]x", true, 12345},
      {"socket:[]", false, 0},
      {"socket:[0]", false, 0},
      {"socket:[99999999999999999999999]", false, 0},  // out of range
      {"[0000]:777", true, 777},
      {"[0000]:777]", false, 0},
      {"[0000]:", false, 0},
      {"pipe:[12345]", false, 0},
      {"anon_inode:[eventpoll]", false, 0},
      {"/dev/null", false, 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.target);
    unsigned long long inode = 0;
    EXPECT_EQ(c.is_socket, SocketInodeOfLink(c.target, &inode));
    if (c.is_socket) {
      EXPECT_EQ(c.inode, inode);
    }
  }
}

}  // namespace
}  // namespace tavow3
