// The sandbox's /dev/log is a real datagram socket whose messages a sink
// process appends to a file; these helpers read them back.
#ifndef TAVOW3_TESTS_SUPPORT_SYSLOG_CAPTURE_H_
#define TAVOW3_TESTS_SUPPORT_SYSLOG_CAPTURE_H_

#include <string>
#include <vector>

namespace tavow3::test {

// Every message logged in this sandbox so far, oldest first, with the syslog
// header stripped: "engine:317 Runtime port 80 conflict for nginx". Before
// reading, logs a unique marker and waits until the sink has written it, so
// every line logged before the call is included (the marker is not).
std::vector<std::string> LogMessages();

// LogMessages() of one priority (LOG_ERR, ...).
std::vector<std::string> LogMessages(int priority);

// LogMessages() whose source tag is `tag` ("nginx_deploy:..." for "nginx_deploy").
std::vector<std::string> TaggedLogMessages(const std::string& tag);
// The same at one priority.
std::vector<std::string> TaggedLogMessages(const std::string& tag, int priority);

// The messages that the regular expression `pattern` (PCRE2) matches entirely;
// a malformed pattern fails the test.
std::vector<std::string> LogsMatching(const std::vector<std::string>& messages,
                                      const std::string& pattern);
// True when one of `messages` matches `pattern` entirely.
bool HasLogMatching(const std::vector<std::string>& messages, const std::string& pattern);

// Forgets the messages so far: later LogMessages() calls start after this point.
void ClearLog();

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_SUPPORT_SYSLOG_CAPTURE_H_
