#include "tavo/service_conf.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <new>
#include <string>
#include <string_view>
#include <vector>

#include "file_util.h"
#include "port_list.h"

namespace {

using tavo::internal::ParsePortList;
using tavo::internal::PortRange;
using tavo::internal::ReadFile;

constexpr std::string_view kBlanks = " \t\r";

struct Section {
  std::string name;
  std::string title;
  std::string title_key;
  std::string desc_key;
  std::string desc;
  std::string desc_extra;
  std::string protocol;
  std::string ports;
  std::vector<std::string> port_entries;
};

std::string_view Trim(std::string_view text) {
  std::string_view::size_type begin = text.find_first_not_of(kBlanks);
  if (begin == std::string_view::npos) return {};
  return text.substr(begin, text.find_last_not_of(kBlanks) - begin + 1);
}

bool IsKey(std::string_view key) {
  if (key.empty()) return false;
  for (char c : key) {
    bool ok = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
              c == '_';
    if (!ok) return false;
  }
  return true;
}

// A value as written after '=': quoted with \" and \\ escapes, or bare.
bool ParseValue(std::string_view raw, std::string* value) {
  if (raw.empty() || raw.front() != '"') {
    value->assign(raw);
    return true;
  }
  value->clear();
  for (size_t i = 1; i < raw.size(); ++i) {
    char c = raw[i];
    if (c == '"') return i + 1 == raw.size();  // nothing may follow the closing quote
    if (c == '\\' && i + 1 < raw.size() && (raw[i + 1] == '"' || raw[i + 1] == '\\')) c = raw[++i];
    value->push_back(c);
  }
  return false;  // no closing quote
}

std::string* Field(Section* section, std::string_view key) {
  if (key == "title") return &section->title;
  if (key == "title_key") return &section->title_key;
  if (key == "desc_key") return &section->desc_key;
  if (key == "desc") return &section->desc;
  if (key == "desc_extra") return &section->desc_extra;
  if (key == "protocol") return &section->protocol;
  if (key == "ports") return &section->ports;
  return nullptr;  // keys this reader does not know are skipped
}

bool ParseLine(std::string_view line, std::vector<Section>* sections) {
  if (line.front() == '[') {
    if (line.back() != ']') return false;
    std::string_view name = Trim(line.substr(1, line.size() - 2));
    if (name.empty() || name.find_first_of("[]") != std::string_view::npos) return false;
    sections->emplace_back();
    sections->back().name.assign(name);
    return true;
  }
  std::string_view::size_type equals = line.find('=');
  if (equals == std::string_view::npos || sections->empty()) return false;
  std::string_view key = Trim(line.substr(0, equals));
  std::string value;
  if (!IsKey(key) || !ParseValue(Trim(line.substr(equals + 1)), &value)) return false;
  std::string* field = Field(&sections->back(), key);
  if (field != nullptr) *field = std::move(value);
  return true;
}

bool IsProtocol(const std::string& protocol) {
  return protocol.empty() || protocol == "tcp" || protocol == "udp" || protocol == "udp,tcp" ||
         protocol == "tcp,udp";
}

bool Parse(std::string_view text, std::vector<Section>* sections) {
  if (text.find('\0') != std::string_view::npos) return false;
  while (!text.empty()) {
    std::string_view::size_type newline = text.find('\n');
    std::string_view line = Trim(text.substr(0, newline));
    text = newline == std::string_view::npos ? std::string_view() : text.substr(newline + 1);
    if (line.empty() || line.front() == '#' || line.front() == ';') continue;
    if (!ParseLine(line, sections)) return false;
  }
  for (Section& section : *sections) {
    std::vector<PortRange> ranges;
    if (!IsProtocol(section.protocol) ||
        !ParsePortList(section.ports, &ranges, &section.port_entries)) {
      return false;
    }
  }
  return true;
}

char* Duplicate(const std::string& text) {
  char* copy = static_cast<char*>(std::malloc(text.size() + 1));
  if (copy != nullptr) std::memcpy(copy, text.c_str(), text.size() + 1);
  return copy;
}

// Copies `entries` into a new array at *out; false when memory runs out
// (what was copied is left for the caller to free).
bool DuplicateAll(const std::vector<std::string>& entries, int* count, char*** out) {
  if (entries.empty()) return true;
  *out = static_cast<char**>(std::calloc(entries.size(), sizeof(char*)));
  if (*out == nullptr) return false;
  *count = static_cast<int>(entries.size());
  for (size_t i = 0; i < entries.size(); ++i) {
    if (((*out)[i] = Duplicate(entries[i])) == nullptr) return false;
  }
  return true;
}

bool FillSection(const Section& from, TAVO_SERVICE_SECTION* to) {
  return (to->name = Duplicate(from.name)) != nullptr &&
         (to->title = Duplicate(from.title)) != nullptr &&
         (to->title_key = Duplicate(from.title_key)) != nullptr &&
         (to->desc_key = Duplicate(from.desc_key)) != nullptr &&
         (to->desc = Duplicate(from.desc)) != nullptr &&
         (to->desc_extra = Duplicate(from.desc_extra)) != nullptr &&
         (to->protocol = Duplicate(from.protocol)) != nullptr &&
         DuplicateAll(from.port_entries, &to->port_count, &to->ports);
}

// Builds the caller's record; null when memory runs out.
TAVO_SERVICE_CONF* MakeRecord(const std::vector<Section>& sections) {
  auto* conf = static_cast<TAVO_SERVICE_CONF*>(std::calloc(1, sizeof(TAVO_SERVICE_CONF)));
  if (conf == nullptr) return nullptr;
  std::vector<std::string> all_ports;
  for (const Section& section : sections) {
    all_ports.insert(all_ports.end(), section.port_entries.begin(), section.port_entries.end());
  }
  bool ok = true;
  if (!sections.empty()) {
    conf->sections =
        static_cast<TAVO_SERVICE_SECTION*>(std::calloc(sections.size(), sizeof(TAVO_SERVICE_SECTION)));
    ok = conf->sections != nullptr;
    if (ok) conf->section_count = static_cast<int>(sections.size());
  }
  for (size_t i = 0; ok && i < sections.size(); ++i) ok = FillSection(sections[i], &conf->sections[i]);
  if (ok) ok = DuplicateAll(all_ports, &conf->port_count, &conf->ports);
  if (!ok) {
    TAVOServiceConfFree(conf);
    return nullptr;
  }
  return conf;
}

void FreeStrings(char** strings, int count) {
  if (strings == nullptr) return;
  for (int i = 0; i < count; ++i) std::free(strings[i]);
  std::free(strings);
}

}  // namespace

int TAVOServiceConfGet(const char* path, TAVO_SERVICE_CONF** conf) {
  if (path == nullptr || conf == nullptr) {
    errno = EINVAL;
    return -1;
  }
  try {
    std::string text;
    if (!ReadFile(path, &text)) return -1;
    std::vector<Section> sections;
    if (!Parse(text, &sections)) {
      errno = EINVAL;
      return -1;
    }
    TAVO_SERVICE_CONF* record = MakeRecord(sections);
    if (record == nullptr) {
      errno = ENOMEM;
      return -1;
    }
    *conf = record;
    return 0;
  } catch (const std::bad_alloc&) {
    errno = ENOMEM;
    return -1;
  }
}

void TAVOServiceConfFree(TAVO_SERVICE_CONF* conf) {
  if (conf == nullptr) return;
  for (int i = 0; i < conf->section_count; ++i) {
    TAVO_SERVICE_SECTION& section = conf->sections[i];
    for (char* text : {section.name, section.title, section.title_key, section.desc_key,
                       section.desc, section.desc_extra, section.protocol}) {
      std::free(text);
    }
    FreeStrings(section.ports, section.port_count);
  }
  std::free(conf->sections);
  FreeStrings(conf->ports, conf->port_count);
  std::free(conf);
}
