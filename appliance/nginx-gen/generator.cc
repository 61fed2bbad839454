#include "generator.h"

#include <vector>

#include "files.h"
#include "output_file.h"
#include "render.h"

namespace tavonginxgen {
namespace {

struct Output {
  const char* path;
  const char* template_name;
};

// The main configuration includes the three fragment directories through
// their links under /etc/nginx; Abnormal removes the first two links.
constexpr Output kOutputs[] = {
    {"/usr/local/etc/nginx/conf.d/tavow3.conf", "tavow3.conf.mustache"},
    {"/usr/local/etc/nginx/sites-enabled/tavow3-www", "tavow3-www.mustache"},
    {"/var/tmp/nginx/nginx.conf", "nginx.conf.mustache"},
};
constexpr const char* kDirectories[] = {
    "/usr/local/etc/nginx/conf.d",
    "/usr/local/etc/nginx/sites-enabled",
    "/var/tmp/nginx/app.d",
};

bool RenderOne(const Output& output, const Json::Value& context, const std::string& template_dir,
               std::string* text, std::string* error) {
  const std::string path = template_dir + "/" + output.template_name;
  std::string template_text;
  if (!tavomustache::ReadWholeFile(path, &template_text, error)) return false;
  if (tavomustache::Render(template_text, context, tavomustache::Escape::kNone, text, error)) {
    return true;
  }
  *error = path + ": " + *error;
  return false;
}

}  // namespace

bool Generate(const Settings& settings, const std::string& template_dir, std::string* error) {
  const Json::Value context = TemplateContext(settings);
  std::vector<std::string> texts;
  for (const Output& output : kOutputs) {
    std::string text;
    if (!RenderOne(output, context, template_dir, &text, error)) return false;
    texts.push_back(std::move(text));
  }
  for (const char* dir : kDirectories) {
    if (!MakeDirectories(dir, error)) return false;
  }
  for (size_t i = 0; i < texts.size(); ++i) {
    if (!tavomustache::WriteFileAtomically(kOutputs[i].path, texts[i], error)) return false;
  }
  return true;
}

}  // namespace tavonginxgen
