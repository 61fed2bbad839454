// Registration of a web front end with the appliance's TLS-profile framework
// and certificate store, and the service names the application portals use.
#ifndef TAVOW3_TLS_REGISTRATION_H_
#define TAVOW3_TLS_REGISTRATION_H_

#include <string>

#include <tavow3/export.h>

namespace tavow3 {

// A service is known to both frameworks by (subscriber, service); the TLS
// framework names it subscriber + "_" + service. None of these functions logs
// or takes a lock: callers serialise them. All are safe to call from any thread.

// Joins the service to the TLS-profile framework with `display_name` and, when
// not empty, the localisation key `display_name_i18n`. True when the framework
// accepted; registering again updates the entry.
[[nodiscard]] TAVOW3_EXPORT bool RegisterTLSProfile(const std::string& subscriber,
                                                    const std::string& service,
                                                    const std::string& display_name,
                                                    const std::string& display_name_i18n);

// Removes the service from the TLS-profile framework. True when it was not
// registered (the framework is then not called) or the framework removed it.
[[nodiscard]] TAVOW3_EXPORT bool UnregisterTLSProfile(const std::string& subscriber,
                                                      const std::string& service);

// Replaces "/usr/tavo/share/certificate.d/<subscriber>.cfg" with a document
// naming this one service, then runs "/usr/tavo/bin/tavocrtregister subscriber
// service". True when the tool exits with 0; a file that cannot be written does
// not stop the tool.
[[nodiscard]] TAVOW3_EXPORT bool RegisterCertificate(const std::string& subscriber,
                                                     const std::string& service,
                                                     const std::string& display_name,
                                                     const std::string& display_name_i18n);

// Runs "/usr/tavo/bin/tavocrtunregister subscriber service" when the directory
// "/usr/tavo/etc/certificate/<subscriber>/<service>" exists; true when there is
// no such directory or the tool exits with 0. The .cfg file stays.
[[nodiscard]] TAVOW3_EXPORT bool UnregisterCertificate(const std::string& subscriber,
                                                       const std::string& service);

// The service name of a portal's custom-domain entry: `name` unchanged.
TAVOW3_EXPORT std::string AppPortalTLSFQDNServiceName(const std::string& name);

// The service name of a portal's HTTPS alternate-port entry: `name` + "_AltPort".
TAVOW3_EXPORT std::string AppPortalTLSAltPortServiceName(const std::string& name);

// Display names of a portal's entries: `name` + " - " + `text`, or the port in decimal.
TAVOW3_EXPORT std::string AppPortalTLSDesc(const std::string& name, const std::string& text);
TAVOW3_EXPORT std::string AppPortalTLSDesc(const std::string& name, const int& port);

}  // namespace tavow3

#endif  // TAVOW3_TLS_REGISTRATION_H_
