#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <memory>

#include "services/kovacontentextractd/readers/office_package.h"
#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

using Token = XmlTokenizer::Token;

constexpr size_t kSheetsMax = 10000;
constexpr size_t kStylesMax = 65536;

struct Workbook {
  std::vector<std::string> sheets;  ///< the ids of their relations
  bool from_1904 = false;           ///< days are counted from 1904, not from 1900
  std::vector<bool> style_is_date;
};

/// Runs `each` on every token of the part until it answers false. False then.
template <typename Each>
bool ForEachToken(ZipContainer& zip, const std::string& part, Each each) {
  const std::unique_ptr<ByteSource> member = part.empty() ? nullptr : zip.Open(part);
  if (member == nullptr) return true;
  XmlTokenizer xml(*member);
  for (Token token = xml.Next(); token != Token::kEnd && token != Token::kBad; token = xml.Next()) {
    if (!each(xml, token)) return false;
  }
  return true;
}

/// Whether a number in this format is shown as a date or a time.
bool IsDateFormat(std::string_view format) {
  bool quoted = false, bracketed = false;
  for (size_t i = 0; i < format.size(); ++i) {
    const char c = format[i];
    if (c == '"') quoted = !quoted;
    if (c == '\\' || c == '_' || c == '*') ++i;
    if (c == '[' || c == ']') bracketed = c == '[';
    if (!quoted && !bracketed && std::string_view("yYdDhHsS").find(c) != std::string_view::npos) return true;
  }
  return false;
}

bool IsBuiltInDateFormat(int id) { return (id >= 14 && id <= 22) || (id >= 27 && id <= 36) || (id >= 45 && id <= 58); }

int ToInt(std::string_view text) {
  int value = 0;
  (void)std::from_chars(text.data(), text.data() + text.size(), value);
  return value;
}

void ReadStyles(ZipContainer& zip, const std::string& part, Workbook& workbook) {
  std::vector<int> date_formats;
  bool in_cell_styles = false;
  (void)ForEachToken(zip, part, [&](XmlTokenizer& xml, Token token) {
    if (token == Token::kText) return true;
    if (xml.Name() == "cellXfs") {
      in_cell_styles = token == Token::kOpen;
    } else if (token == Token::kOpen && xml.Name() == "numFmt") {
      const bool is_date = IsDateFormat(xml.Attribute("formatCode"));
      if (is_date && date_formats.size() < kStylesMax) date_formats.push_back(ToInt(xml.Attribute("numFmtId")));
    } else if (token == Token::kOpen && in_cell_styles && xml.Name() == "xf") {
      const int id = ToInt(xml.Attribute("numFmtId"));
      const bool own = std::find(date_formats.begin(), date_formats.end(), id) != date_formats.end();
      workbook.style_is_date.push_back(own || IsBuiltInDateFormat(id));
    }
    return workbook.style_is_date.size() < kStylesMax;
  });
}

/// Sheets' names are text that people search for.
void ReadSheetList(ZipContainer& zip, const std::string& part, Workbook& workbook, Findings& findings) {
  (void)ForEachToken(zip, part, [&](XmlTokenizer& xml, Token token) {
    if (token != Token::kOpen) return true;
    if (xml.Name() == "workbookPr") {
      workbook.from_1904 = xml.Attribute("date1904") == "1" || xml.Attribute("date1904") == "true";
    } else if (xml.Name() == "sheet") {
      (void)findings.AddText(xml.Attribute("name"));
      findings.Break();
      workbook.sheets.emplace_back(xml.PrefixedAttribute("id"));
    }
    return workbook.sheets.size() < kSheetsMax;
  });
}

/// The table of texts that cells point into is read as it stands, so that it need not be kept.
bool AddSharedTexts(ZipContainer& zip, const std::string& part, Findings& findings) {
  bool in_text = false;
  return ForEachToken(zip, part, [&](XmlTokenizer& xml, Token token) {
    if (token == Token::kText) return !in_text || findings.AddText(xml.Text());
    if (xml.Name() == "t") in_text = token == Token::kOpen;
    if (token == Token::kOpen && xml.Name() == "rPh") xml.SkipElement();  // how to pronounce it
    if (token == Token::kClose && xml.Name() == "si") findings.Break();
    return true;
  });
}

std::string DateText(double days, bool from_1904) {
  constexpr double kEpochDays = 25569, kDays1904 = 1462, kDaysMax = 2958466;
  const double since_1900 = days + (from_1904 ? kDays1904 : 0);
  if (!(since_1900 >= 0 && since_1900 < kDaysMax)) return {};
  const CivilTime time = FromSeconds(std::llround((since_1900 - kEpochDays) * 86400));
  std::array<char, 64> text;
  const bool has_time = days != std::floor(days), has_date = days >= 1;
  int size = 0;
  if (has_date) {
    size = snprintf(text.data(), text.size(), "%04d-%02d-%02d%s", static_cast<int>(time.year), time.month, time.day,
                    has_time ? " " : "");
  }
  if (has_time) {
    size += snprintf(text.data() + size, text.size() - static_cast<size_t>(size), "%02d:%02d", time.hour, time.minute);
  }
  return {text.data(), static_cast<size_t>(size)};
}

/// A number as a sheet shows it, as far as that takes no knowledge of its format.
std::string NumberText(const std::string& stored, bool is_date, bool from_1904) {
  double value = 0;
  const char* end = stored.data() + stored.size();
  if (std::from_chars(stored.data(), end, value).ptr != end) return stored;
  if (is_date) return DateText(value, from_1904);
  std::array<char, 64> text;
  const auto written = std::to_chars(text.data(), text.data() + text.size(), value, std::chars_format::general, 15);
  return {text.data(), written.ptr};
}

/// Adds the texts and numbers of the cells of one sheet that do not point into the table of shared texts.
class SheetReader {
 public:
  SheetReader(const Workbook& workbook, Findings& findings) : workbook_(workbook), findings_(findings) {}

  bool Take(XmlTokenizer& xml, Token token) {
    if (token == Token::kText) {
      if (in_value_ && value_.size() < kValueMaxBytes) value_ += xml.Text();
      return true;
    }
    const std::string_view name = xml.Name();
    if (name == "v" || name == "t") {
      in_value_ = token == Token::kOpen;
    } else if (token == Token::kOpen && name == "c") {
      type_ = xml.Attribute("t");
      style_ = static_cast<size_t>(std::max(0, ToInt(xml.Attribute("s"))));
      value_.clear();
    } else if (token == Token::kOpen && (name == "f" || name == "rPh")) {
      xml.SkipElement();
    } else if (token == Token::kClose && name == "c") {
      return AddCell();
    } else if (token == Token::kClose && name == "row") {
      findings_.Break();
    }
    return true;
  }

 private:
  static constexpr size_t kValueMaxBytes = 64U << 10;

  bool AddCell() {
    const bool is_number = type_.empty() || type_ == "n";
    if (value_.empty() || (!is_number && type_ != "str" && type_ != "inlineStr" && type_ != "d")) return true;
    const bool is_date = style_ < workbook_.style_is_date.size() && workbook_.style_is_date[style_];
    const std::string text = is_number ? NumberText(value_, is_date, workbook_.from_1904) : value_;
    return findings_.AddText(text) && findings_.AddText("\t");
  }

  const Workbook& workbook_;
  Findings& findings_;
  std::string type_;
  size_t style_ = 0;
  bool in_value_ = false;
  std::string value_;
};

}  // namespace

void ReadWorkbook(ZipContainer& zip, const std::string& part, Findings& findings) {
  const std::vector<Relation> relations = ReadRelations(zip, part);
  Workbook workbook;
  ReadSheetList(zip, part, workbook, findings);
  ReadStyles(zip, TargetByType(relations, "styles"), workbook);
  if (!AddSharedTexts(zip, TargetByType(relations, "sharedStrings"), findings)) return;
  for (const std::string& id : workbook.sheets) {
    const std::string sheet = TargetById(relations, id);
    SheetReader reader(workbook, findings);
    if (!ForEachToken(zip, sheet, [&](XmlTokenizer& xml, Token token) { return reader.Take(xml, token); })) return;
    findings.Break();
    for (const Relation& relation : ReadRelations(zip, sheet)) {
      const bool wanted = relation.type == "comments" || relation.type == "drawing";
      if (wanted && !AddParagraphs(zip, relation.target, findings)) return;
    }
  }
}

}  // namespace ferrox::extract
