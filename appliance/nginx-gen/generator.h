// Renders the nginx configuration files from the templates and writes them.
#ifndef TAVO_APPLIANCE_NGINX_GEN_GENERATOR_H_
#define TAVO_APPLIANCE_NGINX_GEN_GENERATOR_H_

#include <string>

#include "settings.h"

namespace tavonginxgen {

// Where the templates are installed.
inline constexpr char kTemplateDir[] = "/usr/tavo/share/nginx";

// Renders every file first and writes them only when all rendered, each
// replaced atomically: the temporary main configuration
// "/var/tmp/nginx/nginx.conf" (the deployers install it as
// /etc/nginx/nginx.conf) and the fragments behind the links /etc/nginx/conf.d
// and /etc/nginx/sites-enabled; the application directory
// "/var/tmp/nginx/app.d" is made when missing. False with a message in *error;
// files written before a failed write stay written.
bool Generate(const Settings& settings, const std::string& template_dir, std::string* error);

}  // namespace tavonginxgen

#endif  // TAVO_APPLIANCE_NGINX_GEN_GENERATOR_H_
