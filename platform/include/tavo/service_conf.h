// Firewall service definition (".sc") files and port-conflict tests.
//
// A ".sc" file is a list of sections; each is a name in brackets followed by
// key="value" lines:
//
//   [ZAM_5000]
//   title="HTTP"
//   title_key="firewall:firewall_service_opt_zam_http"
//   desc_key="firewall:firewall_service_desc_zam_http"
//   desc="ZAM"
//   desc_extra=""
//   ports="5000,8000:8010"
//   protocol="tcp"
//
// `ports` is a comma-separated list of ports and inclusive ranges "A:B";
// `protocol` is "tcp", "udp" or "udp,tcp" ("tcp,udp" and "" are accepted too).
// Blank lines and lines starting with '#' or ';' are skipped, blanks around
// names, keys and values are ignored, and keys this reader does not know are
// skipped. Quoted values are unescaped: \" and \\ stand for " and \; a bare
// value is taken as written.
#ifndef TAVO_SERVICE_CONF_H_
#define TAVO_SERVICE_CONF_H_

struct TAVO_SERVICE_SECTION {
  char* name;
  char* title;        // "" when absent; so are the other strings
  char* title_key;
  char* desc_key;
  char* desc;
  char* desc_extra;
  char* protocol;
  int port_count;
  char** ports;       // the entries of the section's port list, as written
};

struct TAVO_SERVICE_CONF {
  int section_count;
  TAVO_SERVICE_SECTION* sections;
  int port_count;     // every port entry of every section, in file order
  char** ports;
};

// Reads the service file `path`. On success returns 0 and stores a new record
// in `*conf`, which the caller frees with TAVOServiceConfFree. Returns -1 with
// errno set (EINVAL for a malformed file: a line that is neither a section
// nor key=value, a key before the first section, an unterminated quote, a bad
// port list or protocol) and leaves `*conf` unchanged.
int TAVOServiceConfGet(const char* path, TAVO_SERVICE_CONF** conf);

// Frees a record of TAVOServiceConfGet; null is ignored.
void TAVOServiceConfFree(TAVO_SERVICE_CONF* conf);

// One entry of a conflict list: a single port.
struct TAVO_SERVICE_PORTS {
  int port;
  TAVO_SERVICE_PORTS* next;
};

// Frees a list of TLIBIsPortConflict; null is ignored.
void TAVOServiceConfPortsFree(TAVO_SERVICE_PORTS* list);

// Compares two comma-separated port lists (ports and "A:B" ranges; empty
// entries, such as the one after a trailing comma, are skipped; ports are 1
// to 65535) that both hold ports of the protocol `proto` ("tcp" or "udp").
// Returns 0 and stores null in `*conflicts` when no port of `candidates` lies
// in `claimed`. Returns 1 when some do and stores in `*conflicts` a new list
// of those candidate ports, each once, in ascending order, at most
// `max_conflicts` of them, which the caller frees with
// TAVOServiceConfPortsFree. Returns -1 with errno EINVAL for a malformed list
// or protocol, a `max_conflicts` below 1 or a null pointer, storing nothing.
// The buffers are not modified.
int TLIBIsPortConflict(char* claimed, char* candidates, const char* proto, int max_conflicts,
                       TAVO_SERVICE_PORTS** conflicts);

#endif  // TAVO_SERVICE_CONF_H_
