#include "tavo/service_conf.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <string>
#include <vector>

#include "support/test_files.h"

namespace {

using tavow3::test::WriteBytes;

constexpr char kPath[] = "/tmp/test.sc";

std::vector<std::string> Strings(char** strings, int count) {
  return std::vector<std::string>(strings, strings + count);
}

TEST(TAVOServiceConfGet, ReadsSectionsAsTheGeneratorWritesThem) {
  WriteBytes(kPath,
             "# generated\n"
             "[ZAM_5000]\n"
             "title=\"HTTP\"\n"
             "title_key=\"firewall:firewall_service_opt_zam_http\"\n"
             "desc_key=\"firewall:firewall_service_desc_zam_http\"\n"
             "desc=\"ZAM\"\n"
             "desc_extra=\"\"\n"
             "ports=\"5000,8000:8010\"\n"
             "protocol=\"tcp\"\n"
             "\n"
             "; second section, hand-edited\r\n"
             "  [ ReverseProxy_443 ]  \r\n"
             "  desc = \"say \\\"hi\\\" \\\\ bye\"\r\n"
             "future_key=\"ignored\"\n"
             "ports=\" 443 , 1:1 ,65535,\"\n"
             "protocol=udp,tcp\n"
             "[Empty]\n");
  TAVO_SERVICE_CONF* conf = nullptr;
  ASSERT_EQ(0, TAVOServiceConfGet(kPath, &conf));
  ASSERT_EQ(3, conf->section_count);
  const TAVO_SERVICE_SECTION& zam = conf->sections[0];
  EXPECT_STREQ("ZAM_5000", zam.name);
  EXPECT_STREQ("HTTP", zam.title);
  EXPECT_STREQ("firewall:firewall_service_opt_zam_http", zam.title_key);
  EXPECT_STREQ("firewall:firewall_service_desc_zam_http", zam.desc_key);
  EXPECT_STREQ("ZAM", zam.desc);
  EXPECT_STREQ("", zam.desc_extra);
  EXPECT_STREQ("tcp", zam.protocol);
  EXPECT_EQ((std::vector<std::string>{"5000", "8000:8010"}), Strings(zam.ports, zam.port_count));
  const TAVO_SERVICE_SECTION& proxy = conf->sections[1];
  EXPECT_STREQ("ReverseProxy_443", proxy.name);
  EXPECT_STREQ("say \"hi\" \\ bye", proxy.desc);
  EXPECT_STREQ("", proxy.title);
  EXPECT_STREQ("udp,tcp", proxy.protocol);
  EXPECT_EQ((std::vector<std::string>{"443", "1:1", "65535"}),
            Strings(proxy.ports, proxy.port_count));
  EXPECT_STREQ("Empty", conf->sections[2].name);
  EXPECT_EQ(0, conf->sections[2].port_count);
  EXPECT_STREQ("", conf->sections[2].protocol);
  EXPECT_EQ((std::vector<std::string>{"5000", "8000:8010", "443", "1:1", "65535"}),
            Strings(conf->ports, conf->port_count));
  TAVOServiceConfFree(conf);
  TAVOServiceConfFree(nullptr);
}

TEST(TAVOServiceConfGet, EmptyFileHasNoSections) {
  for (const char* text : {"", "\n# nothing\n; here\n"}) {
    WriteBytes(kPath, text);
    TAVO_SERVICE_CONF* conf = nullptr;
    ASSERT_EQ(0, TAVOServiceConfGet(kPath, &conf));
    EXPECT_EQ(0, conf->section_count);
    EXPECT_EQ(0, conf->port_count);
    TAVOServiceConfFree(conf);
  }
}

TEST(TAVOServiceConfGet, RefusesMalformedFiles) {
  const std::string ok = "[S]\nports=\"80\"\n";
  const std::string cases[] = {
      "ports=\"80\"\n",                 // key before any section
      "[]\n",                           // empty name
      "[ ]\n",                          //
      "[S\n",                           // unclosed
      "[S] x\n",                        // text after the name
      "[S[T]]\n",                       //
      ok + "just words\n",              // neither section nor key=value
      ok + "=\"v\"\n",                  // empty key
      ok + "ti tle=\"v\"\n",            // bad key
      ok + "desc=\"open\n",             // unterminated quote
      ok + "desc=\"a\" b\n",            // text after the closing quote
      ok + "desc=\"a\\\"\n",            // the only quote is escaped
      "[S]\nports=\"0\"\n",             // ports out of range
      "[S]\nports=\"65536\"\n",         //
      "[S]\nports=\"80:79\"\n",         // reversed range
      "[S]\nports=\"80-90\"\n",         //
      "[S]\nports=\"http\"\n",          //
      "[S]\nports=\"+80\"\n",           //
      "[S]\nports=\"80:\"\n",           //
      "[S]\nports=\"1:2:3\"\n",         //
      "[S]\nprotocol=\"icmp\"\n",       // unknown protocol
      "[S]\nprotocol=\"TCP\"\n",        //
      std::string("[S]\ndesc=\"a\0b\"\n", 15),  // NUL byte
  };
  for (const std::string& text : cases) {
    SCOPED_TRACE(text);
    WriteBytes(kPath, text);
    TAVO_SERVICE_CONF sentinel;
    TAVO_SERVICE_CONF* conf = &sentinel;
    errno = 0;
    EXPECT_EQ(-1, TAVOServiceConfGet(kPath, &conf));
    EXPECT_EQ(EINVAL, errno);
    EXPECT_EQ(&sentinel, conf);
  }
}

TEST(TAVOServiceConfGet, UnreadableFile) {
  TAVO_SERVICE_CONF* conf = nullptr;
  errno = 0;
  EXPECT_EQ(-1, TAVOServiceConfGet("/tmp/missing.sc", &conf));
  EXPECT_EQ(ENOENT, errno);
  errno = 0;
  EXPECT_EQ(-1, TAVOServiceConfGet("/tmp", &conf));
  EXPECT_EQ(EISDIR, errno);
  EXPECT_EQ(nullptr, conf);
  EXPECT_EQ(-1, TAVOServiceConfGet(nullptr, &conf));
  EXPECT_EQ(-1, TAVOServiceConfGet(kPath, nullptr));
}

}  // namespace
