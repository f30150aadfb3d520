#include "cli/document.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <iterator>

#include "cli/escape.h"
#include "cli/format.h"
#include "cli/output.h"
#include "common/file_util.h"
#include "wire/fields.h"

namespace ferrox::cli {

namespace {

using namespace fileindex::elastic;  // the fields' names

/// Of a text's beginning; --text shows all of it.
constexpr size_t kTextShownBytes = 300;
/// Fields that are no lines of their own: the path says the same, or another line shows them.
constexpr const char* kShownElsewhere[] = {kKOVAMDPath,        kKOVAMDParent,         kKOVAMDFSName,
                                           kKOVAMDKind,        kKOVAMDSearchFileName, kKOVAMDDisplayName,
                                           kKOVAMDIsDir,       kKOVAMDExtension,      kKOVAMDContentType,
                                           kKOVAMDFSSize,      kKOVAMDLogicalSize,    kKOVAMDContentModificationDate,
                                           k_KOVAExtractError, k_KOVAExtractVersion,  k_KOVANeedMeta,
                                           k_KOVAStamp,        k_KOVATextEncoding,    k_KOVATextCut};

/// One field, indented below the path. `value` is escaped already.
void PrintLine(const std::string& name, const std::string& value) {
  (void)printf("    %s: %s\n", EscapeForTerminal(name).c_str(), value.c_str());
}

/// Whether the content was read, by what, and why not.
std::string Reading(const Json::Value& document, const std::string& unwanted) {
  if (BoolOf(document, kKOVAMDIsDir)) return "a folder";
  if (!document[k_KOVANeedMeta].isBool()) {
    return "found by its name only" + (unwanted.empty() ? "" : ": " + EscapeForTerminal(unwanted));
  }
  const std::string error = TextOf(document, k_KOVAExtractError);
  const std::string reader = " (reader version " + std::to_string(IntOf(document, k_KOVAExtractVersion)) + ")";
  if (StringStartWith(error, kPartlyRead)) return EscapeOneLine(error) + reader;
  if (!error.empty()) return "not read, or not all: " + EscapeOneLine(error) + reader;
  if (document[k_KOVATextCut].isBool()) return std::string(kPartlyRead) + "only the beginning of its text" + reader;
  return IntOf(document, k_KOVAExtractVersion) == 0 ? "no reader for this type" : "read" + reader;
}

/// The size of the text and its beginning, cut between two characters.
void PrintText(const Json::Value& document, const std::string& text) {
  if (text.empty()) return;
  const std::string encoding = TextOf(document, k_KOVATextEncoding);
  PrintLine("text", Size(static_cast<int64_t>(text.size())) +
                        (encoding.empty() ? "" : ", was " + EscapeOneLine(encoding)) +
                        (document[k_KOVATextCut].isBool() ? ", the beginning of more" : ""));
  size_t end = std::min(text.size(), kTextShownBytes);
  // Back to the first byte of the character that the limit falls into.
  while (end < text.size() && (static_cast<unsigned char>(text[end]) & 0xC0) == 0x80) --end;
  (void)printf("        %s%s\n", EscapeOneLine(text.substr(0, end)).c_str(), end < text.size() ? " ..." : "");
}

}  // namespace

std::string FriendlyName(const std::string& field) {
  for (const char* prefix : {"_KOVAMD", "_KOVA", "KOVAMD", "KOVA"}) {
    if (StringStartWith(field, prefix)) return field.substr(std::string(prefix).size());
  }
  return field;
}

/// Fields that end in "Date" hold seconds.
std::string FieldText(const std::string& field, const Json::Value& value) {
  const bool is_date = field.size() > 4 && field.compare(field.size() - 4, 4, "Date") == 0;
  if (is_date && value.isInt64()) return Date(value.asInt64());
  if (value.isString()) return EscapeOneLine(value.asString());
  if (value.isNumeric() || value.isBool()) return value.asString();
  std::string joined;
  for (const Json::Value& element : value) joined += (joined.empty() ? "" : "; ") + FieldText(field, element);
  return joined;
}

void PrintDocument(const Json::Value& document, const std::string& text, Fields fields, const std::string& unwanted) {
  (void)printf("%s\n", EscapeForTerminal(TextOf(document, kKOVAMDPath)).c_str());
  if (fields == Fields::kAll || BoolOf(document, kKOVAMDIsDir)) PrintLine("content", Reading(document, unwanted));
  if (document.isMember(kKOVAMDContentType)) PrintLine("type", EscapeOneLine(TextOf(document, kKOVAMDContentType)));
  PrintLine("size", Size(IntOf(document, kKOVAMDFSSize)));
  for (const std::string& field : document.getMemberNames()) {
    const bool is_shown =
        std::find(std::begin(kShownElsewhere), std::end(kShownElsewhere), field) != std::end(kShownElsewhere);
    if (!is_shown) PrintLine(FriendlyName(field), FieldText(field, document[field]));
  }
  PrintText(document, text);
}

void PrintWholeText(const std::string& text) { PrintBytes(isatty(STDOUT_FILENO) == 1 ? EscapeText(text) : text); }

}  // namespace ferrox::cli
