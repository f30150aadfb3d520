#include <iterator>

#include <kova/content_extract.h>
#include <kova/content_type.h>

namespace kova::content {

namespace {

using namespace std::literals;

constexpr Format kFormats[] = {
    {"application/json", "plain", Program::kGeneral, 1},
    {"application/toml", "plain", Program::kGeneral, 1},
    {"application/x-cue", "plain", Program::kGeneral, 1},
    {"application/xml-dtd", "plain", Program::kGeneral, 1},
    {"application/yaml", "plain", Program::kGeneral, 1},
    {"audio/x-mpegurl", "plain", Program::kGeneral, 1},
    {"audio/x-scpls", "plain", Program::kGeneral, 1},
    {"text/html", "html", Program::kGeneral, 1},
    {"application/xhtml+xml", "html", Program::kGeneral, 1},
    {"application/xml", "xml", Program::kGeneral, 1},
    {"text/x-opml", "xml", Program::kGeneral, 1},
};

/// What is none of the above.
constexpr Format kOtherXml = {"", "xml", Program::kGeneral, 1};
constexpr Format kOtherText = {"", "plain", Program::kGeneral, 1};

}  // namespace

const Format kUnknown = {"", "unknown", Program::kGeneral, 1};

const char* ProgramName(Program program) {
  static constexpr const char* kNames[kPrograms] = {"kovacontentworker", "kovacontentworker-pdf",
                                                    "kovacontentworker-photo"};
  return kNames[static_cast<int>(program)];
}

const Format* FormatOf(std::string_view type) {
  for (const Format& format : kFormats) {
    if (format.type == type) return &format;
  }
  if (type.size() > 4 && type.substr(type.size() - 4) == "+xml"sv) return &kOtherXml;
  return type.substr(0, 5) == "text/"sv ? &kOtherText : nullptr;
}

}  // namespace kova::content

int KOVA::CONTENT_EXTRACT::ExtractVersion(const std::string& content_type) {
  const kova::content::Format* format = kova::content::FormatOf(content_type);
  return format != nullptr ? format->version : 0;
}
