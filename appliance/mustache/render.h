// The rendering core of tavomustache: JSON documents as mustache data, and a
// template rendered with one of three escapings of {{name}} variables.
#ifndef TAVO_APPLIANCE_MUSTACHE_RENDER_H_
#define TAVO_APPLIANCE_MUSTACHE_RENDER_H_

#include <json/value.h>
#include <kainjow/mustache.hpp>

#include <string>

namespace tavomustache {

// How {{name}} is escaped; {{{name}}} and {{&name}} are always inserted as is.
enum class Escape {
  // Quoted values of service files (key="value"): '\' and '"' get a
  // backslash, and a value holding a control character (a line break, say)
  // fails the render, since no quoted value can carry it. The default.
  kServiceConf,
  kHtml,  // & < > " and ' as HTML entities, as plain mustache does
  kNone,
};

// "sc", "html" or "none". False for any other name.
bool ParseEscape(const std::string& name, Escape* escape);

// The mustache data of a JSON value: objects and arrays as such, strings as
// strings, numbers as their shortest decimal text, booleans as booleans, and
// null as false (it hides a section and prints nothing).
kainjow::mustache::data ToMustacheData(const Json::Value& value);

// Renders `template_text` with the object `document` as its context into
// *output. False with a message in *error for an invalid template, a partial
// ({{>name}}: there are none), or a value the escaping refuses; *output is
// then unspecified.
bool Render(const std::string& template_text, const Json::Value& document, Escape escape,
            std::string* output, std::string* error);

}  // namespace tavomustache

#endif  // TAVO_APPLIANCE_MUSTACHE_RENDER_H_
