#include "engine/firewall_sections.h"

#include <map>
#include <set>
#include <vector>

namespace tavow3 {
namespace {

using Group = std::vector<const FQDNPortSchemaResource*>;

std::string Join(const std::set<std::string>& items) {
  std::string joined;
  for (const std::string& item : items) {
    if (!joined.empty()) joined += ", ";
    joined += item;
  }
  return joined;
}

const char* ProtocolName(int protocol) {
  switch (protocol) {
    case 0:
      return "tcp";
    case 1:
      return "udp";
    case 2:
      return "udp,tcp";
    default:
      return nullptr;
  }
}

// Texts of resources with a description key describe the keyed entry; texts
// of resources without one are shown beside it (or alone when no key exists).
void AddDescriptions(const Group& group, Json::Value* section) {
  std::set<std::string> keys, keyed_texts, plain_texts;
  for (const FQDNPortSchemaResource* resource : group) {
    if (!resource->desc_key.empty()) {
      keys.insert(resource->desc_key);
      if (!resource->desc.empty()) keyed_texts.insert(resource->desc);
    } else if (!resource->desc.empty()) {
      plain_texts.insert(resource->desc);
    }
  }
  if (!keys.empty()) {
    (*section)["desc_key"] = Join(keys);
    if (!keyed_texts.empty()) (*section)["desc"] = Join(keyed_texts);
    if (!plain_texts.empty()) (*section)["desc_extra"] = Join(plain_texts);
  } else if (!plain_texts.empty()) {
    (*section)["desc"] = Join(plain_texts);
  }
}

Json::Value BuildSection(unsigned short port, const Group& group, const std::string& owner) {
  Json::Value section(Json::objectValue);
  section["port"] = port;
  std::string name = (owner == "tavow3" ? "ReverseProxy_" : "VirtualHost_") + std::to_string(port);
  std::string title_key;
  int protocol = group.front()->protocol;
  for (const FQDNPortSchemaResource* resource : group) {
    if (!resource->section.empty()) name = resource->section;
    if (!resource->title_key.empty()) title_key = resource->title_key;
    if (resource->protocol != protocol) protocol = 2;
  }
  section["section"] = name;
  section["title"] = group.front()->schema != FQDNPortSchemaResource::HTTP ? "HTTPS" : "HTTP";
  if (!title_key.empty()) section["title_key"] = title_key;
  AddDescriptions(group, &section);
  if (const char* protocol_name = ProtocolName(protocol)) section["protocol"] = protocol_name;
  return section;
}

}  // namespace

Json::Value BuildFirewallSections(const Engine::Private& registry, const std::string& owner) {
  std::map<unsigned short, Group> groups;
  for (const auto& entry : registry.fqdn_resources) {
    const FQDNPortSchemaResource& resource = entry.second;
    if (resource.owner == owner) groups[resource.port].push_back(&resource);
  }
  Json::Value sections(Json::arrayValue);
  for (const auto& [port, group] : groups) sections.append(BuildSection(port, group, owner));
  return sections;
}

}  // namespace tavow3
