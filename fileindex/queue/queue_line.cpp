#include "fileindex/queue/queue_line.h"

#include <algorithm>

#include <json/value.h>

#include "common/json_util.h"

namespace ferrox::fileindex {

namespace {

/// What JSON does not allow in a text as it is. Bytes above 0x7f stay, be they UTF-8 or not.
bool NeedsEscape(char c) { return static_cast<unsigned char>(c) < 0x20 || c == '"' || c == '\\'; }

/// A control character always by its number: readers take "\u000a" as well as "\n", and one form is less code.
void AppendEscaped(std::string& text, char c) {
  constexpr char kHex[] = "0123456789abcdef";
  text += '\\';
  if (c == '"' || c == '\\') {
    text += c;
  } else {
    text += "u00";
    text += kHex[static_cast<unsigned char>(c) >> 4];
    text += kHex[c & 0xf];
  }
}

/// Appends what needs no escape piece by piece: names are looked through once and seldom need any.
void AppendText(std::string& text, std::string_view value) {
  while (true) {
    const auto special = std::find_if(value.begin(), value.end(), NeedsEscape);
    const auto plain = static_cast<size_t>(special - value.begin());
    text.append(value.data(), plain);
    if (plain == value.size()) return;
    AppendEscaped(text, *special);
    value.remove_prefix(plain + 1);
  }
}

}  // namespace

std::string CustomEventLine(int event, const std::string& path, const std::string& path_old, const Json::Value& data) {
  Json::Value line(Json::objectValue);
  line["event"] = event;
  line["path"] = path;
  line["path_old"] = path_old;
  line["data"] = data;
  return toString(line) + "\n";
}

/// Written piece by piece into the caller's buffer, which collects the lines of one write.
void AppendChangeLine(std::string& text, uint32_t event, bool is_folder, std::string_view path,
                      std::string_view path_old) {
  text += "{\"event\":";
  text += std::to_string(event);
  text += is_folder ? ",\"is_dir\":true,\"path\":\"" : ",\"is_dir\":false,\"path\":\"";
  AppendText(text, path);
  text += "\",\"path_old\":\"";
  AppendText(text, path_old);
  text += "\",\"data\":null}\n";
}

void AppendFilesLine(std::string& text, std::string_view folder, const std::set<uint64_t>& files) {
  AppendChangeLine(text, 0, true, folder, "");
  // The data of any other line is null: here the numbers take its place.
  constexpr std::string_view kEnd = "null}\n";
  text.resize(text.size() - kEnd.size());
  text.append("{\"").append(kFilesMember).append("\":[");
  for (const uint64_t file : files) text += std::to_string(file) + ",";
  text.back() = ']';
  text += "}}\n";
}

}  // namespace ferrox::fileindex
