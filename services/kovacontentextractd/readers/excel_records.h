#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/reader.h"

/// BIFF, the format of Excel's files from 2 to 2003, is a row of records: a type (2 bytes), the size of the content (2
/// bytes, at most 8224 in BIFF8), the content. All numbers have their low byte first. Since Excel 5 the records are the
/// stream "Workbook" or "Book" of a compound file; before, they are the file itself. Read are: cells, notes, texts of
/// drawings and charts, names of sheets; of formulas the result, never the expression.
namespace ferrox::extract {

/// The records of a workbook, one at a time; of the last one, which may be cut off, what there is.
class ExcelRecords {
 public:
  /// The types of the records that are read.
  enum RecordType : uint16_t {
    kBof2 = 0x0009,  // of Excel 2, and what follows it: of 3 and 4
    kBof3 = 0x0209,
    kBof4 = 0x0409,
    kBof = 0x0809,
    kFilePass = 0x002F,
    kCodePage = 0x0042,
    kDateMode = 0x0022,
    kBoundSheet = 0x0085,
    kSharedTexts = 0x00FC,
    kContinue = 0x003C,
    kFormat = 0x041E,
    kExtendedFormat = 0x00E0,
    kLabel = 0x0204,
    kRichLabel = 0x00D6,
    kNumber = 0x0203,
    kShortNumber = 0x027E,
    kShortNumbers = 0x00BD,
    kFormula = 0x0006,
    kFormula3 = 0x0206,
    kFormula4 = 0x0406,
    kFormulaText = 0x0207,
    kFormulaText2 = 0x0007,
    kInteger2 = 0x0002,
    kNumber2 = 0x0003,
    kLabel2 = 0x0004,
    kNote = 0x001C,
    kTextObject = 0x01B6,
    kSeriesText = 0x100D,
  };

  explicit ExcelRecords(ByteSource& stream) : stream_(stream) {}

  /// Goes to the next one; false behind the last.
  bool Next();
  uint16_t Type() const { return type_; }
  std::string_view Content() const { return content_; }

 private:
  ByteSource& stream_;
  uint16_t type_ = 0;
  std::string content_;
};

/// The table of texts (SST), to which cells of BIFF8 refer by number. Text is taken in the table's order, so that no
/// table has to be kept in memory: a search does not ask in which cell a word stands.
///
/// The first record has two counts of 4 bytes, of which the second is that of the texts; the table goes on in kContinue
/// records. A text is: length in characters (2 bytes), flags (1 byte: 1 two bytes a character, 4 phonetic data, 8 runs
/// of formats), the number of runs (2 bytes, with flag 8), the size of the phonetic data (4 bytes, with flag 4), the
/// characters, then runs of 4 bytes and phonetic data, which are passed over. Where the end of a record cuts the
/// characters, the next record begins with a new byte of flags.
class ExcelSharedTexts {
 public:
  /// `records` is at the table's first record.
  ExcelSharedTexts(ExcelRecords& records, Findings& findings) : records_(records), findings_(findings) {}

  /// Adds the texts, and leaves the first record behind the table as the current one; false when that is none, or no
  /// more text is taken.
  bool Add();

 private:
  void NextRecord();
  uint32_t Number(size_t size);
  bool AddText();
  void Skip(uint64_t count);

  ExcelRecords& records_;
  Findings& findings_;
  size_t at_ = 0;
  bool in_table_ = true;
  bool ended_ = false;
};

}  // namespace ferrox::extract
