#include "services/kovaelasticd/query/kinds.h"

#include <string>

#include "base/text.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

namespace {

struct KindName {
  const char* name;
  Kind kind;
};
constexpr KindName kKindNames[] = {
    {"document", kDocument}, {"doc", kDocument}, {"audio", kAudio},     {"music", kAudio}, {"sound", kAudio},
    {"song", kAudio},        {"video", kVideo},  {"movie", kVideo},     {"film", kVideo},  {"clip", kVideo},
    {"image", kImage},       {"photo", kImage},  {"picture", kImage},   {"pic", kImage},   {"other", kOther},
    {"folder", kFolder},     {"dir", kFolder},   {"directory", kFolder}};

constexpr char kText[] = "txt text md markdown rst adoc asc log nfo org tex me readme";
constexpr char kSpreadsheet[] = "xls xlsx xlsm xlsb xlt xltx ods ots fods csv tsv gnumeric numbers";
constexpr char kPresentation[] = "ppt pptx pptm pps ppsx ppsm pot potx odp otp fodp key";
constexpr char kEbook[] = "epub mobi azw azw3 fb2 djvu lit prc";
constexpr char kMail[] = "eml emlx msg mbox";
constexpr char kSource[] =
    "c cc cpp cxx h hh hpp hxx m mm cs java kt groovy scala go rs swift d py pyw pl pm rb php js mjs jsx tsx lua r hs "
    "clj el erl ex ml lisp scm f f90 for pas asm s vb vbs ps1 bat cmd sh bash zsh tcl awk sql css scss less cmake mk";
constexpr char kArchive[] = "zip tar gz tgz bz2 tbz tbz2 xz txz zst tzst 7z rar z lz lzma lzo cab ar cpio deb rpm jar";

struct ExtensionsName {
  const char* name;
  const char* extensions;
};
constexpr ExtensionsName kExtensionsNames[] = {{"text", kText},          {"spreadsheet", kSpreadsheet},
                                               {"sheet", kSpreadsheet},  {"table", kSpreadsheet},
                                               {"excel", kSpreadsheet},  {"presentation", kPresentation},
                                               {"slide", kPresentation}, {"powerpoint", kPresentation},
                                               {"pdf", "pdf"},           {"ebook", kEbook},
                                               {"book", kEbook},         {"mail", kMail},
                                               {"email", kMail},         {"message", kMail},
                                               {"source", kSource},      {"code", kSource},
                                               {"script", kSource},      {"archive", kArchive},
                                               {"zip", kArchive}};

std::optional<NamedKind> FindExactly(const std::string& name) {
  for (const KindName& known : kKindNames) {
    if (name == known.name) return NamedKind{known.kind, {}};
  }
  for (const ExtensionsName& known : kExtensionsNames) {
    if (name == known.name) return NamedKind{std::nullopt, known.extensions};
  }
  return std::nullopt;
}

}  // namespace

std::optional<NamedKind> FindKind(std::string_view name) {
  std::string lower = base::LowerAscii(std::string(name));
  std::optional<NamedKind> found = FindExactly(lower);
  if (found.has_value() || !lower.ends_with('s')) return found;
  lower.pop_back();
  if (found = FindExactly(lower); found.has_value() || !lower.ends_with("ie")) return found;
  return FindExactly(lower.substr(0, lower.size() - 2) + "y");
}

}  // namespace ferrox::engine
