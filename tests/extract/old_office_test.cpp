#include "services/kovacontentextractd/readers/old_office.h"

#include <bit>

#include <gtest/gtest.h>

#include "services/kovacontentextractd/readers/rich_text.h"
#include "tests/extract/reader_support.h"

namespace ferrox::extract::test {

namespace {

constexpr uint32_t kEnd = 0xFFFFFFFE, kFree = 0xFFFFFFFF;

std::string Utf16(const std::u16string& text) {
  std::string bytes;
  for (const char16_t unit : text) bytes += Little(unit, 2);
  return bytes;
}

/// A compound file with 512-byte sectors: the table, the folder, the table of small sectors, the stream of small
/// sectors, then the big streams. Streams below 4,096 bytes are in small sectors, as they must be.
class CompoundBuilder {
 public:
  explicit CompoundBuilder(const Members& streams) {
    for (const auto& [name, content] : streams) Place(name, content);
    folder_.insert(0, Entry("Root Entry", 5, 3, small_.size()));
    Pad(folder_, 512);
    const size_t folder_sectors = folder_.size() / 512, small_sectors = Sectors(small_);
    const auto first_small = static_cast<uint32_t>(1 + folder_sectors + 1);
    std::string table =
        Little(0xFFFFFFFD, 4) + ChainOf(1, folder_sectors) + Little(kEnd, 4) + ChainOf(first_small, small_sectors);
    const auto first_big = static_cast<uint32_t>(table.size() / 4);
    for (const auto& [entry, size] : big_) {
      const auto start = static_cast<uint32_t>(table.size() / 4);
      folder_.replace(128 + entry * 128 + 116, 4, Little(start, 4));
      table += ChainOf(start, (size + 511) / 512);
    }
    (void)first_big;
    folder_.replace(116, 4, Little(first_small, 4));
    table.resize(512, '\xFF');
    small_table_.resize(512, '\xFF');
    Pad(small_, 512);
    header_ = "\xD0\xCF\x11\xE0\xA1\xB1\x1A\xE1" + Little(0, 16) + Little(0x3E, 2) + Little(3, 2) + Little(0xFFFE, 2) +
              Little(9, 2) + Little(6, 2) + Little(0, 10) + Little(1, 4) + Little(1, 4) + Little(0, 4) +
              Little(4096, 4) + Little(1 + folder_sectors, 4) + Little(1, 4) + Little(kEnd, 4) + Little(0, 4) +
              Little(0, 4);
    header_.resize(512, '\xFF');
    bytes_ = header_ + table + folder_ + small_table_ + small_ + big_bytes_;
  }
  const std::string& Bytes() const { return bytes_; }

 private:
  static void Pad(std::string& bytes, size_t to) { bytes.resize((bytes.size() + to - 1) / to * to); }
  static size_t Sectors(const std::string& bytes) { return (bytes.size() + 511) / 512; }
  static std::string ChainOf(uint32_t first, size_t count) {
    std::string chain;
    for (size_t i = 1; i <= count; ++i) chain += Little(i == count ? kEnd : first + i, 4);
    return chain;
  }
  static std::string Entry(const std::string& name, int type, uint32_t start, size_t size) {
    std::string entry = Utf16(std::u16string(name.begin(), name.end()));
    const size_t name_bytes = entry.size() + 2;
    entry.resize(64);
    entry += Little(name_bytes, 2) + Little(static_cast<uint64_t>(type), 1) + Little(1, 1) + Little(kFree, 4) +
             Little(kFree, 4) + Little(kFree, 4) + Little(0, 36) + Little(start, 4) + Little(size, 4) + Little(0, 4);
    return entry;
  }
  void Place(const std::string& name, const std::string& content) {
    if (content.size() >= 4096) {
      big_.emplace_back(folder_.size() / 128, content.size());
      folder_ += Entry(name, 2, 0, content.size());
      big_bytes_ += content;
      Pad(big_bytes_, 512);
      return;
    }
    const auto start = static_cast<uint32_t>(small_.size() / 64);
    folder_ += Entry(name, 2, start, content.size());
    small_ += content;
    Pad(small_, 64);
    small_table_ += ChainOf(start, small_.size() / 64 - start);
  }

  std::string header_, folder_, small_, small_table_, big_bytes_, bytes_;
  std::vector<std::pair<size_t, size_t>> big_;
};

std::string PropertySet(const std::vector<std::pair<uint32_t, std::string>>& properties) {
  std::string list, values;
  for (const auto& [id, value] : properties) {
    list += Little(id, 4) + Little(8 + properties.size() * 8 + values.size(), 4);
    values += value + std::string((4 - value.size() % 4) % 4, '\0');
  }
  return Little(0xFFFE, 2) + Little(0, 22) + Little(1, 4) + Little(0, 16) + Little(48, 4) +
         Little(8 + list.size() + values.size(), 4) + Little(properties.size(), 4) + list + values;
}

std::string Narrow(const std::string& text) { return Little(30, 4) + Little(text.size() + 1, 4) + text + '\0'; }

std::string WordSample() {
  const std::string first =
      "Gr\xFC\xDF"
      "e\x13 HYPERLINK x \x14link\x15\r";
  const std::u16string second = u"мир 世界\r";
  std::string document = Little(0xA5EC, 2) + Little(0xC1, 2) + Little(0, 6) + Little(0x0200, 2);
  document.resize(0x1A2);
  document += Little(3, 4) + Little(5 + 12 + 16, 4);
  document.resize(0x400);
  document += first;
  document.resize(0x500);
  document += Utf16(second);
  document.resize(5000);
  const uint32_t middle = static_cast<uint32_t>(first.size()), end = middle + static_cast<uint32_t>(second.size());
  const std::string pieces = Little(0, 4) + Little(middle, 4) + Little(end, 4) + Little(0, 2) +
                             Little(0x40000000 | 0x400 * 2, 4) + Little(0, 2) + Little(0, 2) + Little(0x500, 4) +
                             Little(0, 2);
  const std::string summary =
      PropertySet({{1, Little(2, 4) + Little(1251, 2)},
                   {2, Narrow("\xCE\xF2\xF7\xB8\xF2")},
                   {4, Narrow("Anna")},
                   {12, Little(64, 4) + Little((1709294400ULL + 11644473600ULL) * 10000000, 8)}});
  return CompoundBuilder({{"WordDocument", document},
                          {"1Table", "xxx" + Little(2, 1) + Little(pieces.size(), 4) + pieces},
                          {"\005SummaryInformation", summary}})
      .Bytes();
}

std::string Record(uint16_t type, const std::string& content) {
  return Little(type, 2) + Little(content.size(), 2) + content;
}

std::string ExcelSample() {
  const auto number = [](double value) { return Little(std::bit_cast<uint64_t>(value), 8); };
  const auto cell = [](int row, int style) {
    return Little(static_cast<uint64_t>(row), 2) + Little(0, 2) + Little(static_cast<uint64_t>(style), 2);
  };
  std::string book =
      Record(0x0809, Little(0x0600, 2) + Little(5, 2)) + Record(0x041E, Little(170, 2) + Little(4, 2) + '\0' + "yyyy") +
      Record(0x00E0, Little(0, 4)) + Record(0x00E0, Little(0, 2) + Little(170, 2)) +
      Record(0x0085, Little(0, 6) + '\x07' + '\0' + "Ums\xE4tze") +
      // The second text begins in one byte a character, and goes on in two in the next record.
      Record(0x00FC, Little(2, 4) + Little(2, 4) + Little(6, 2) + '\0' + "Berlin" + Little(6, 2) + '\x08' +
                         Little(1, 2) + "ab") +
      Record(0x003C, '\x01' + Utf16(u"東京都市") + Little(0, 4)) + Record(0x0203, cell(0, 0) + number(12.5)) +
      Record(0x0203, cell(0, 1) + number(45352)) + Record(0x027E, cell(1, 0) + Little(1234 << 2 | 3, 4)) +
      Record(0x00BD, Little(2, 2) + Little(0, 2) + Little(0, 2) + Little(7 << 2 | 2, 4) + Little(0, 2) +
                         Little(8 << 2 | 2, 4) + Little(1, 2)) +
      Record(0x0204, cell(3, 0) + Little(2, 2) + '\x01' + Utf16(u"ёж")) + Record(0x000A, "");
  book.resize(std::max<size_t>(book.size(), 4096));
  return CompoundBuilder({{"Workbook", book}}).Bytes();
}

std::string PowerPointSample() {
  const auto atom = [](uint16_t type, const std::string& content) {
    return Little(0, 2) + Little(type, 2) + Little(content.size(), 4) + content;
  };
  const auto holder = [](uint16_t type, const std::string& content) {
    return Little(15, 2) + Little(type, 2) + Little(content.size(), 4) + content;
  };
  const std::string slides =
      holder(0x03F8, atom(0x0FA8, "master")) +
      holder(0x03EE, atom(0x0400, "xx") + holder(0xF00D, atom(0x0FA0, Utf16(u"Первый\rслайд")))) +
      holder(0x03EE, atom(0x0FA8,
                          "Gr\xF6\xDF"
                          "e"));
  return CompoundBuilder({{"PowerPoint Document", slides}, {"Current User", Little(0, 16)}}).Bytes();
}

const char kRichText[] =
    "{\\rtf1\\ansi\\ansicpg1252{\\fonttbl{\\f0\\fcharset0 Arial;}{\\f1\\fcharset204 Arial Cyr;}{\\f2\\fcharset134 "
    "SimSun;}}"
    "{\\colortbl;\\red0;}{\\info{\\upr{\\title Bericht ?}{\\*\\ud{\\title Bericht f\\'fcr {\\b \\u1074?}}}}{\\author "
    "Anna}{\\creatim\\yr2024\\mo3\\dy1\\hr12\\min0}}"
    "{\\*\\unknown hidden}{\\pict\\bin2 {}}\\f0 Gr\\'fc\\'dfe\\par {\\f1 \\'ec\\'e8\\'f0}, "
    "\\f2\\'d6\\'d0\\'ce\\'c4\\par\\f0 "
    "\\u26481?\\u20140?{\\uc0\\u55357\\u56832}{\\field{\\*\\fldinst HYPERLINK x}{\\fldrslt "
    "link}}\\cell\\{x\\}\\emdash\\row}";

}  // namespace

TEST(OldOfficeTest, WordTextInPieces) {
  const Json::Value document = Read(&ReadOldOffice, WordSample(), "doc");
  EXPECT_EQ("Grüßelink\nмир 世界\n", Text(document));
  EXPECT_EQ("Отчёт", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Anna", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ(1709294400, document["KOVAMDContentCreationDate"].asInt64());
}

TEST(OldOfficeTest, WordBefore97InTheEncodingOfItsCountry) {
  const auto word95 = [](uint64_t flags, const std::string& text) {
    std::string document = Little(0xA5DC, 2) + Little(0x68, 2) + Little(0, 6) + Little(flags, 2) + Little(0, 12) +
                           Little(0x300, 4) + Little(0x300 + text.size(), 4);
    document.resize(0x300);
    return CompoundBuilder({{"WORDDOCUMENT", document + text},
                            {"\005SummaryInformation", PropertySet({{1, Little(2, 4) + Little(1251, 2)}})}})
        .Bytes();
  };
  EXPECT_EQ("Вина\n", Text(Read(&ReadOldOffice, word95(0, "\xC2\xE8\xED\xE0\r"), "doc")));
  EXPECT_EQ("東京\n", Text(Read(&ReadOldOffice, word95(0x1000, Utf16(u"東京\r")), "doc"))) << "of East Asia";
}

TEST(OldOfficeTest, ExcelTextsAndNumbers) {
  EXPECT_EQ("Umsätze\nBerlin\nab東京都市\n12.5\t2024-03-01\t\n12.34\t\n7\t8\t\nёж\t",
            Text(Read(&ReadOldOffice, ExcelSample(), "xls")));
}

TEST(OldOfficeTest, PowerPointTextWithoutItsMasters) {
  EXPECT_EQ("Первый\nслайд\nGröße\n", Text(Read(&ReadOldOffice, PowerPointSample(), "ppt")));
}

TEST(OldOfficeTest, OutlookMessage) {
  const std::string sent =
      Little(0x00390040, 4) + Little(6, 4) + Little((1709294400ULL + 11644473600ULL) * 10000000, 8);
  const std::string message = CompoundBuilder({{"__properties_version1.0", std::string(32, '\0') + sent},
                                               {"__substg1.0_0037001F", Utf16(u"Привет")},
                                               {"__substg1.0_0C1A001F", Utf16(u"Anna")},
                                               {"__substg1.0_1000001F", Utf16(u"Text\r\n")}})
                                  .Bytes();
  const Json::Value document = Read(&ReadOldOffice, message, "msg");
  EXPECT_EQ("Привет", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Anna", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ("Text\r\n", Text(document));
  EXPECT_EQ(1709294400, document["KOVAMDContentCreationDate"].asInt64());
}

TEST(OldOfficeTest, CyclesAndDamageAreBorne) {
  std::string cycle = ExcelSample();
  for (size_t at = 512; at < 1024; at += 4)
    cycle.replace(at, 4, Little((at - 512) / 4, 4));  // each sector behind itself
  (void)Read(&ReadOldOffice, cycle, "xls");
  EXPECT_EQ("damaged", Text(Read(&ReadOldOffice, "no file", "doc"), "_KOVAExtractError"));
  Abuse(&ReadOldOffice, WordSample(), "doc");
  Abuse(&ReadOldOffice, ExcelSample(), "xls");
  Abuse(&ReadOldOffice, PowerPointSample(), "ppt");
}

TEST(RichTextTest, CodePagesUnicodeAndInformation) {
  const Json::Value document = Read(&ReadRichText, std::string(kRichText, sizeof kRichText - 1), "rtf");
  EXPECT_EQ("Grüße\nмир, 中文\n東京😀link\t{x}—\n", Text(document));
  EXPECT_EQ("Bericht für в", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Anna", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ(1709294400, document["KOVAMDContentCreationDate"].asInt64());
}

TEST(RichTextTest, DamageIsBorne) {
  EXPECT_EQ("damaged", Text(Read(&ReadRichText, "{\\rtf1" + std::string(1 << 20, '{'), "rtf"), "_KOVAExtractError"));
  Abuse(&ReadRichText, kRichText, "rtf");
}

}  // namespace ferrox::extract::test
