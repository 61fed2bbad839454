// tavomustache: renders a mustache template with a JSON document.
//
//   tavomustache [--escape sc|html|none] TEMPLATE JSON -o OUT
//
// The JSON document (an object) is the template's context. OUT is replaced
// atomically and only after the whole render succeeded, so a failing run
// leaves an existing OUT as it was. {{name}} is escaped for the quoted values
// of service files unless --escape says otherwise. Exit status 0 on success,
// 1 when a file or the render fails, 2 for wrong arguments.
#include <json/reader.h>

#include <cstdio>
#include <memory>
#include <string>

#include "output_file.h"
#include "render.h"

namespace {

constexpr char kUsage[] = "usage: tavomustache [--escape sc|html|none] TEMPLATE JSON -o OUT\n";

struct Arguments {
  std::string template_path;
  std::string json_path;
  std::string output_path;
  tavomustache::Escape escape = tavomustache::Escape::kServiceConf;
};

bool ParseArguments(int argc, char** argv, Arguments* args, std::string* error) {
  std::string positional[2];
  int positional_count = 0;
  bool has_output = false;
  for (int i = 1; i < argc; ++i) {
    const std::string arg = argv[i];
    if (arg == "-o" || arg == "--escape") {
      if (i + 1 == argc) {
        *error = "option " + arg + " needs a value";
        return false;
      }
      const std::string value = argv[++i];
      if (arg == "-o") {
        args->output_path = value;
        has_output = true;
      } else if (!tavomustache::ParseEscape(value, &args->escape)) {
        *error = "unknown escaping \"" + value + "\"";
        return false;
      }
    } else if (arg.size() > 1 && arg[0] == '-') {
      *error = "unknown option " + arg;
      return false;
    } else if (positional_count == 2) {
      *error = "unexpected argument " + arg;
      return false;
    } else {
      positional[positional_count++] = arg;
    }
  }
  if (positional_count != 2 || !has_output || args->output_path.empty()) {
    *error = "TEMPLATE, JSON and -o OUT are required";
    return false;
  }
  args->template_path = positional[0];
  args->json_path = positional[1];
  return true;
}

bool ParseDocument(const std::string& text, Json::Value* document, std::string* error) {
  Json::CharReaderBuilder builder;
  Json::CharReaderBuilder::strictMode(&builder.settings_);
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  if (!reader->parse(text.data(), text.data() + text.size(), document, error)) return false;
  if (!document->isObject()) {
    *error = "the document must be a JSON object";
    return false;
  }
  return true;
}

int Fail(const std::string& what, const std::string& message) {
  std::fprintf(stderr, "tavomustache: %s%s\n", what.c_str(), message.c_str());
  return 1;
}

}  // namespace

int main(int argc, char** argv) {
  Arguments args;
  std::string error;
  if (!ParseArguments(argc, argv, &args, &error)) {
    std::fprintf(stderr, "tavomustache: %s\n%s", error.c_str(), kUsage);
    return 2;
  }
  std::string template_text, json_text, output;
  Json::Value document;
  if (!tavomustache::ReadWholeFile(args.template_path, &template_text, &error)) {
    return Fail("", error);
  }
  if (!tavomustache::ReadWholeFile(args.json_path, &json_text, &error)) return Fail("", error);
  if (!ParseDocument(json_text, &document, &error)) return Fail(args.json_path + ": ", error);
  if (!tavomustache::Render(template_text, document, args.escape, &output, &error)) {
    return Fail(args.template_path + ": ", error);
  }
  if (!tavomustache::WriteFileAtomically(args.output_path, output, &error)) return Fail("", error);
  return 0;
}
