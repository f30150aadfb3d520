#include <algorithm>
#include <charconv>
#include <map>
#include <memory>

#include "services/kovacontentextractd/readers/cell_numbers.h"
#include "services/kovacontentextractd/readers/office_package.h"

namespace ferrox::extract {

namespace {

using Token = XmlTokenizer::Token;

// A workbook is several parts: the list of sheets, styles, the table of texts that cells share, and a part for each
// sheet with its cells by rows. A cell (c) has a type (t: s a number in the table of texts, str, inlineStr and d a text
// of its own, n or nothing a number), the number of its style (s) and its value (v). Texts are read from their table,
// not where cells use them, so each occurs once however many cells have it.

constexpr size_t kSheetsMax = 10000;
constexpr size_t kSheetStylesMax = 65536;

/// What reading a sheet needs of the other parts.
struct Workbook {
  std::vector<std::string> sheets;  ///< the ids of their relations
  bool from_1904 = false;           ///< days are counted from 1904, not from 1900
  std::vector<NumberFormat> styles;
};

/// Runs `each` on every token of the part until it answers false. False then.
template <typename Each>
bool ForEachToken(ZipContainer& zip, const std::string& part, Each each) {
  const std::unique_ptr<ByteSource> member = part.empty() ? nullptr : zip.Open(part);
  if (member == nullptr) return true;
  XmlTokenizer xml(*member);
  for (Token token; xml.Next(token);) {
    if (!each(xml, token)) return false;
  }
  return true;
}

int ToInt(std::string_view text) {
  int value = 0;
  (void)std::from_chars(text.data(), text.data() + text.size(), value);
  return value;
}

/// The number format of each style of cells, by the styles' places in the list "cellXfs".
void ReadStyles(ZipContainer& zip, const std::string& part, Workbook& workbook) {
  std::map<int, NumberFormat> formats;
  bool in_cell_styles = false;
  (void)ForEachToken(zip, part, [&](XmlTokenizer& xml, Token token) {
    if (token == Token::kText) return true;
    if (xml.Name() == "cellXfs") {
      in_cell_styles = token == Token::kOpen;
    } else if (token == Token::kOpen && xml.Name() == "numFmt" && formats.size() < kSheetStylesMax) {
      formats[ToInt(xml.Attribute("numFmtId"))] = ParseNumberFormat(xml.Attribute("formatCode"));
    } else if (token == Token::kOpen && in_cell_styles && xml.Name() == "xf") {
      const int id = ToInt(xml.Attribute("numFmtId"));
      const auto own = formats.find(id);
      workbook.styles.push_back(own != formats.end() ? own->second : BuiltInNumberFormat(id));
    }
    return workbook.styles.size() < kSheetStylesMax;
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

/// What is no number stands as it is.
std::string StoredNumberText(const std::string& stored, const NumberFormat& format, bool from_1904) {
  double value = 0;
  const char* end = stored.data() + stored.size();
  if (std::from_chars(stored.data(), end, value).ptr != end) return stored;
  return NumberText(value, format, from_1904);
}

/// Adds the texts and numbers of the cells of one sheet that do not point into the table of shared texts.
class SheetReader {
 public:
  SheetReader(const Workbook& workbook, Findings& findings) : workbook_(workbook), findings_(findings) {}

  /// One token of the sheet. Formulas are passed over: what they give is the value beside them.
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
    const NumberFormat format = style_ < workbook_.styles.size() ? workbook_.styles[style_] : NumberFormat();
    const std::string text = is_number ? StoredNumberText(value_, format, workbook_.from_1904) : value_;
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
  std::map<std::string, std::string> targets = TargetsById(relations);
  for (const std::string& id : workbook.sheets) {
    const std::string& sheet = targets[id];
    SheetReader reader(workbook, findings);
    if (!ForEachToken(zip, sheet, [&](XmlTokenizer& xml, Token token) { return reader.Take(xml, token); })) return;
    findings.Break();
    const std::vector<Relation> beside = ReadRelations(zip, sheet);
    if (!AddRelated(zip, beside, {"comments", "drawing"}, findings)) return;
    const std::string drawing = TargetByType(beside, "drawing");
    if (!drawing.empty() && !AddRelated(zip, ReadRelations(zip, drawing), {"chart"}, findings)) return;
  }
}

}  // namespace ferrox::extract
