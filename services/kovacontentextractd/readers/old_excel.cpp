#include <algorithm>
#include <bit>
#include <map>
#include <string>
#include <vector>

#include "services/kovacontentextractd/readers/cell_numbers.h"
#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/excel_records.h"
#include "services/kovacontentextractd/readers/little_endian.h"
#include "services/kovacontentextractd/readers/old_office_parts.h"

namespace ferrox::extract {

namespace {

/// The version in a kBof record of Excel 97 and later: texts are in UTF-16, or in its low bytes where these are enough.
/// Before, they are in the code page that kCodePage names.
constexpr uint16_t kBiff8 = 0x0600;
/// More formats or styles than a workbook may have.
constexpr size_t kStylesMax = 65536;

/// Reads a workbook of any version. All sheets of a book are one stream of records, so the row of a cell is all that is
/// kept of its place: cells of one row are joined by tabs, in the order of the file.
class WorkbookReader {
 public:
  using enum ExcelRecords::RecordType;

  WorkbookReader(ByteSource& stream, Findings& findings) : records_(stream), findings_(findings) {}

  void Read() {
    bool have = records_.Next();
    if (!have || !IsBegin(records_.Type())) return findings_.Fail("damaged");
    biff8_ = records_.Type() == kBof && Little16(records_.Content(), 0) == kBiff8;
    cell_bytes_ = records_.Type() == kBof2 ? 7 : 6;  // Excel 2 has three bytes of attributes in place of a style
    while (have) {
      if (records_.Type() == kSharedTexts && biff8_) {
        have = ExcelSharedTexts(records_, findings_).Add();
      } else {
        have = Take(records_.Content()) && records_.Next();
      }
    }
  }

 private:
  /// Takes what `record` says of the workbook or its sheets. False when nothing more is to be read.
  bool Take(std::string_view record) {
    switch (records_.Type()) {
      case kFilePass:
        findings_.Fail("encrypted");
        return false;
      case kCodePage:
        code_page_ = Little16(record, 0);
        return true;
      case kDateMode:
        from_1904_ = Little16(record, 0) != 0;
        return true;
      case kFormat:
        return TakeFormat(record);
      case kExtendedFormat:
        return TakeStyle(record);
      case kBoundSheet:  // the sheet's place (4 bytes) and kind (2), its name
        return AddLine(Text(record, 6, 1));
      case kNote:
        return biff8_ || AddLine(Text(record, 4, 2));
      case kSeriesText:
        return AddLine(Text(record, 2, 1));
      case kTextObject:
        object_characters_ = Little16(record, 10);
        return true;
      case kContinue:
        return AddObjectText(record);
      default:
        return TakeCell(record);
    }
  }

  /// Takes a cell: row, column, style (2 bytes each), then what the type of the record says. The numbers in the calls
  /// are the place of the value, and of a text the bytes of its length.
  bool TakeCell(std::string_view record) {
    switch (records_.Type()) {
      case kLabel:
      case kRichLabel:
        return AddCell(record, Text(record, 6, 2));
      case kLabel2:
        return AddCell(record, Text(record, 7, 1));
      case kFormulaText:
        return AddInRow(row_, Text(record, 0, 2));
      case kFormulaText2:
        return AddInRow(row_, Text(record, 0, 1));
      case kInteger2:
        return AddNumber(record, Little16(record, 7));
      case kNumber:
      case kNumber2:
        return AddNumber(record, Double(record, cell_bytes_));
      case kShortNumber:
        return AddNumber(record, Short(Little32(record, 6)));
      case kShortNumbers:
        return AddShortNumbers(record);
      case kFormula:
      case kFormula3:
      case kFormula4:
        return TakeFormula(record);
      default:
        return true;
    }
  }

  static bool IsBegin(uint16_t type) { return type == kBof2 || type == kBof3 || type == kBof4 || type == kBof; }

  /// The result of a formula has 8 bytes: a number, unless the last two are FFFF. A text then follows in a record of
  /// its own, which does not repeat the row; truth values and errors are left out.
  bool TakeFormula(std::string_view record) {
    const bool is_number = Little16(record, cell_bytes_ + 6) != 0xFFFF;
    if (is_number) return AddNumber(record, Double(record, cell_bytes_));
    row_ = Little16(record, 0);
    return true;
  }

  /// A comment or the text of a drawing stands in the records behind it, each with a byte that tells its width.
  bool AddObjectText(std::string_view record) {
    if (object_characters_ == 0 || record.empty()) return true;
    const size_t width = (record[0] & 1) != 0 ? 2 : 1;
    const std::string_view bytes = record.substr(1, object_characters_ * width);
    object_characters_ -= std::min(object_characters_, std::max<size_t>(1, bytes.size() / width));
    const bool more = findings_.AddText(width == 2 ? FromUtf16Little(bytes) : FromCodePage(bytes, 1252));
    if (object_characters_ == 0) findings_.Break();
    return more;
  }

  /// A number's format with its id, which styles refer to.
  bool TakeFormat(std::string_view record) {
    if (formats_.size() < kStylesMax)
      formats_[Little16(record, 0)] = ParseNumberFormat(Text(record, 2, biff8_ ? 2 : 1));
    return true;
  }

  /// A style, of which cells name the number in the order of the file: only its number format matters here.
  bool TakeStyle(std::string_view record) {
    const int id = Little16(record, 2);
    const auto own = formats_.find(id);
    if (styles_.size() < kStylesMax) styles_.push_back(own != formats_.end() ? own->second : BuiltInNumberFormat(id));
    return true;
  }

  /// The text at `at`: its length in `length_bytes`, in BIFF8 a byte of flags (1: two bytes a character), its
  /// characters.
  std::string Text(std::string_view record, size_t at, size_t length_bytes) const {
    const auto length = static_cast<size_t>(LittleEndian(record, at, length_bytes));
    at += length_bytes;
    const bool wide = biff8_ && at < record.size() && (record[at] & 1) != 0;
    if (biff8_) ++at;
    const std::string_view bytes = record.substr(std::min(at, record.size()), length * (wide ? 2 : 1));
    return wide ? FromUtf16Little(bytes) : FromCodePage(bytes, biff8_ ? 1252 : code_page_);
  }

  static double Double(std::string_view record, size_t at) {
    return std::bit_cast<double>(LittleEndian(record, at, 8));
  }

  /// An RK number: 30 bits of an integer (bit 1 set) or the upper 30 bits of a double (not set), which bit 0 says to
  /// divide by 100.
  static double Short(uint32_t packed) {
    const double value = (packed & 2) != 0 ? static_cast<double>(static_cast<int32_t>(packed) >> 2)
                                           : std::bit_cast<double>(uint64_t{packed & ~3U} << 32);
    return (packed & 1) != 0 ? value / 100 : value;
  }

  /// Several numbers side by side: row, first column, then style (2 bytes) and RK number (4) of each, last column.
  bool AddShortNumbers(std::string_view record) {
    for (size_t at = 4; at + 6 + 2 <= record.size(); at += 6) {
      if (!AddValue(Little16(record, 0), Little16(record, at), Short(Little32(record, at + 2)))) return false;
    }
    return true;
  }

  bool AddNumber(std::string_view record, double value) {
    return AddValue(Little16(record, 0), Little16(record, 4), value);
  }

  bool AddValue(uint16_t row, uint16_t style, double value) {
    const NumberFormat format = style < styles_.size() ? styles_[style] : NumberFormat();
    return AddInRow(row, NumberText(value, format, from_1904_));
  }

  bool AddCell(std::string_view record, const std::string& text) { return AddInRow(Little16(record, 0), text); }

  bool AddInRow(uint16_t row, const std::string& text) {
    if (row != row_) findings_.Break();
    row_ = row;
    return findings_.AddText(text) && findings_.AddText("\t");
  }

  bool AddLine(const std::string& text) {
    findings_.Break();
    const bool more = findings_.AddText(text);
    findings_.Break();
    return more;
  }

  ExcelRecords records_;
  Findings& findings_;
  bool biff8_ = true;
  bool from_1904_ = false;
  int code_page_ = 1252;
  uint16_t row_ = 0;
  size_t cell_bytes_ = 6;         ///< before a cell's value: its row, column and style
  size_t object_characters_ = 0;  ///< of a drawing's text that are still to come
  std::map<int, NumberFormat> formats_;
  std::vector<NumberFormat> styles_;
};

}  // namespace

void ReadOldExcel(ByteSource& book, Findings& findings) { WorkbookReader(book, findings).Read(); }

}  // namespace ferrox::extract
