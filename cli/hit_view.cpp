#include "cli/hit_view.h"

#include <cstdio>

#include "cli/document.h"
#include "cli/escape.h"
#include "cli/format.h"
#include "cli/search_notes.h"
#include "common/file_util.h"
#include "fileindex/util.h"
#include "wire/fields.h"

/// All text of a hit comes from files and names, and is escaped before anything is put around it, so that no file can
/// draw on the terminal.
namespace ferrox::cli {

namespace {

namespace field = fileindex::elastic;

constexpr size_t kIndent = 4;

/// In one word. What is no folder goes by its extension, as it does for the choice of what is read.
std::string KindOf(const Json::Value& fields, const std::string& path) {
  constexpr const char* kKinds[] = {"document", "audio", "video", "image", "other"};
  if (BoolOf(fields, field::kKOVAMDIsDir)) return "folder";
  return kKinds[fileindex::GetFileTypeByFullPath(path)];
}

std::string FactsOf(const Json::Value& fields, const std::string& path) {
  return KindOf(fields, path) + ", " + Size(IntOf(fields, field::kKOVAMDFSSize)) + ", " +
         Date(IntOf(fields, field::kKOVAMDFSContentChangeDate));
}

/// A passage escaped between the marks of its matches, which stay.
std::string EscapedPassage(const std::string& passage) {
  std::string escaped;
  std::string part;
  for (const char byte : passage + kMatchEnd) {
    if (byte != kMatchBegin && byte != kMatchEnd) {
      part += byte;
      continue;
    }
    escaped += EscapeOneLine(part) + byte;
    part.clear();
  }
  escaped.pop_back();  // the mark that closed the last part
  return escaped;
}

std::string WithMarks(const std::string& passage, const char* begin, const char* end) {
  std::string shown;
  for (const char byte : passage) {
    if (byte == kMatchBegin) {
      shown += begin;
    } else if (byte == kMatchEnd) {
      shown += end;
    } else {
      shown += byte;
    }
  }
  return shown;
}

std::string Styled(const std::string& text, const char* style, const Terminal& terminal) {
  return terminal.styles ? std::string("\033[") + style + "m" + text + "\033[0m" : text;
}

void PrintWrapped(const std::string& text, const Terminal& terminal, const char* style = "") {
  // Brackets take room on the line; styles do not.
  const std::string lines = Wrapped(terminal.styles ? text : WithMarks(text, "[", "]"), terminal.columns, kIndent);
  const std::string shown = WithMarks(lines, "\033[1m", "\033[0m");
  (void)printf("%*s%s\n", static_cast<int>(kIndent), "",
               *style == '\0' ? shown.c_str() : Styled(shown, style, terminal).c_str());
}

/// "camera: NIKON D750": the values of the fields that one condition looks into. Nothing where the file has none.
std::string AskedText(const Json::Value& asked, const Json::Value& fields) {
  std::string values;
  for (const Json::Value& name : asked["fields"]) {
    if (!name.isString() || !fields.isMember(name.asString())) continue;
    const std::string value = FieldText(name.asString(), fields[name.asString()]);
    if (values.find(value) == std::string::npos) values += (values.empty() ? "" : ", ") + value;
  }
  const std::string name = EscapeOneLine(TextOf(asked, "name"));
  return values.empty() ? "" : (StringStartWith(name, "KOVA") ? FriendlyName(name) : name) + ": " + values;
}

/// The name is what people know a file by; a title tells more, and then the name goes with the folder.
void PrintForPeople(const Json::Value& hit, const Json::Value& asked, const Terminal& terminal) {
  const Json::Value& fields = hit["fields"];
  const std::string path = TextOf(hit, "doc_id");
  const std::string title = TitleToShow(hit, path);
  const std::string head = Styled(title.empty() ? EscapeForTerminal(Basename(path)) : title, "1;36", terminal);
  (void)printf("%s\n", terminal.links ? Linked(path, head).c_str() : head.c_str());
  PrintWrapped(EscapeForTerminal(title.empty() ? Dirname(path) : path), terminal, "36");
  const std::string passage = TextOf(hit, "snippet");
  if (!passage.empty()) PrintWrapped(EscapedPassage(passage), terminal);
  for (const Json::Value& condition : asked) {
    const std::string text = AskedText(condition, fields);
    if (!text.empty()) PrintWrapped(text, terminal);
  }
  PrintWrapped(FactsOf(fields, path), terminal, "2");
  PrintExplanation(hit);
  (void)printf("\n");
}

}  // namespace

void PrintHit(const Json::Value& hit, const Json::Value& asked, const Terminal& terminal) {
  if (terminal.is_there) return PrintForPeople(hit, asked, terminal);
  const std::string path = TextOf(hit, "doc_id");
  (void)printf("%s\n", EscapeForTerminal(path).c_str());
  const std::string title = TitleToShow(hit, path);
  if (!title.empty()) (void)printf("    %s\n", title.c_str());
  const std::string passage = TextOf(hit, "snippet");
  if (!passage.empty()) (void)printf("    %s\n", WithMarks(EscapedPassage(passage), "[", "]").c_str());
  (void)printf("    %s\n", FactsOf(hit["fields"], path).c_str());
  PrintExplanation(hit);
}

}  // namespace ferrox::cli
