#include "render.h"

#include <charconv>
#include <stdexcept>

namespace tavomustache {
namespace {

namespace mustache = kainjow::mustache;

// Thrown by the service-file escaping out of the renderer's callback.
class UnrenderableValue : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// `value` for a message: control characters as C escapes.
std::string Printable(const std::string& value) {
  static const char kHex[] = "0123456789abcdef";
  std::string text;
  for (char c : value) {
    const unsigned char byte = static_cast<unsigned char>(c);
    if (c == '\n') {
      text += "\\n";
    } else if (c == '\t') {
      text += "\\t";
    } else if (byte < 0x20 || byte == 0x7f) {
      text += std::string("\\x") + kHex[byte >> 4] + kHex[byte & 15];
    } else {
      text += c;
    }
  }
  return text;
}

std::string EscapeServiceConf(const std::string& value) {
  std::string escaped;
  escaped.reserve(value.size());
  for (char c : value) {
    const unsigned char byte = static_cast<unsigned char>(c);
    if (byte < 0x20 || byte == 0x7f) {
      throw UnrenderableValue("value \"" + Printable(value) +
                              "\" holds a control character, which a quoted value cannot carry");
    }
    if (c == '\\' || c == '"') escaped += '\\';
    escaped += c;
  }
  return escaped;
}

std::string EscapeNone(const std::string& value) { return value; }

std::string NumberText(const Json::Value& value) {
  if (value.isInt64()) return std::to_string(value.asInt64());
  if (value.isUInt64()) return std::to_string(value.asUInt64());
  char buffer[64];
  const auto result = std::to_chars(buffer, buffer + sizeof(buffer), value.asDouble());
  return std::string(buffer, result.ptr);
}

// The data's own members are the context; partials are not looked up in it
// (a string member must never become template text), and asking for one is
// remembered so that the render can fail.
class DataContext : public mustache::context<std::string> {
 public:
  explicit DataContext(const mustache::data* root) : mustache::context<std::string>(root) {}

  const mustache::data* get_partial(const std::string& name) const override {
    partial_asked_ = true;
    partial_name_ = name;
    return nullptr;
  }

  bool partial_asked() const { return partial_asked_; }
  const std::string& partial_name() const { return partial_name_; }

 private:
  mutable bool partial_asked_ = false;
  mutable std::string partial_name_;
};

}  // namespace

bool ParseEscape(const std::string& name, Escape* escape) {
  if (name == "sc") {
    *escape = Escape::kServiceConf;
  } else if (name == "html") {
    *escape = Escape::kHtml;
  } else if (name == "none") {
    *escape = Escape::kNone;
  } else {
    return false;
  }
  return true;
}

mustache::data ToMustacheData(const Json::Value& value) {
  switch (value.type()) {
    case Json::nullValue:
      return mustache::data(false);
    case Json::booleanValue:
      return mustache::data(value.asBool());
    case Json::intValue:
    case Json::uintValue:
    case Json::realValue:
      return mustache::data(NumberText(value));
    case Json::stringValue:
      return mustache::data(value.asString());
    case Json::arrayValue: {
      mustache::data list(mustache::data::type::list);
      for (const Json::Value& item : value) list.push_back(ToMustacheData(item));
      return list;
    }
    case Json::objectValue: {
      mustache::data object(mustache::data::type::object);
      for (const std::string& name : value.getMemberNames()) {
        object.set(name, ToMustacheData(value[name]));
      }
      return object;
    }
  }
  return mustache::data(false);
}

bool Render(const std::string& template_text, const Json::Value& document, Escape escape,
            std::string* output, std::string* error) {
  mustache::mustache tmpl(template_text);
  if (!tmpl.is_valid()) {
    *error = "invalid template: " + tmpl.error_message();
    return false;
  }
  if (escape == Escape::kServiceConf) tmpl.set_custom_escape(EscapeServiceConf);
  if (escape == Escape::kNone) tmpl.set_custom_escape(EscapeNone);
  const mustache::data data = ToMustacheData(document);
  DataContext context(&data);
  try {
    *output = tmpl.render(context);
  } catch (const UnrenderableValue& refused) {
    *error = refused.what();
    return false;
  }
  if (!tmpl.is_valid()) {
    *error = "cannot render: " + tmpl.error_message();
    return false;
  }
  if (context.partial_asked()) {
    *error = "partial \"" + context.partial_name() + "\" is not supported";
    return false;
  }
  return true;
}

}  // namespace tavomustache
