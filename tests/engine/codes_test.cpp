// Catches numbers and codes that are found only as they were written, and tables of numbers that fill an index.
#include "services/kovaelasticd/text/codes.h"

#include <string>

#include <gtest/gtest.h>

#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {
namespace {

/// The further words of a text, a blank behind each.
std::string Further(const std::string& text) {
  std::string all;
  WordScanner scanner(text);
  CodeScanner codes(text);
  while (scanner.Next()) {
    for (const std::string& word : codes.At(scanner.Begin(), scanner.End())) all += word + " ";
  }
  return all;
}

std::string Joined(const std::string& text) {
  std::string all;
  for (const std::string& word : JoinedCodes(text)) all += word;
  return all;
}

TEST(CodesTest, EveryWayOfWritingACodeHasOneWord) {
  const std::string same[][4] = {
      {"ab12345", "AB-1234/5", "AB1234/5", "ab_1234-5"},
      {"3456789", "34.567,89", "34,567.89", "34567.89"},
      {"20220705", "2022-07-05", "2022.07.05", "2022/07/05"},
      {"de89370400440532013000", "DE89 3704 0044 0532 0130 00", "DE89-3704-0044-0532-0130-00",
       "DE893704 00440532013000"},
      {"0891234567", "(089) 1234-567", "089 / 1234567", "089/123 45 67"},
      {"iso9001", "ISO 9001", "ISO-9001", "ISO/9001"},
      {"001a2b3c4d5e", "00:1A:2B:3C:4D:5E", "00-1a-2b-3c-4d-5e", "001a.2b3c.4d5e"},
  };
  for (const auto& ways : same) {
    for (const std::string& way : ways) {
      if (&way == &ways[0]) continue;
      EXPECT_NE((" " + Further("see " + way + ", x")).find(" " + ways[0] + " "), std::string::npos) << way;
      EXPECT_EQ(Joined(way), ways[0]) << way;
    }
  }
  EXPECT_EQ(Joined("iso 9001") + Joined("gb29 nwbk 6016 1331 9268 19"),
            Further("ISO 9001").substr(0, 7) + "gb29nwbk60161331926819")
      << "a query may be in small letters";
}

TEST(CodesTest, IdentifiersHaveTheirParts) {
  EXPECT_EQ(Further("camelCase XMLHttpRequest snake_case"), "camel case xml http request ");
  EXPECT_EQ(Further("AB1234 sha256"), "ab 1234 sha 256 ");
  EXPECT_EQ(Further("v2.10.3 20220705_1755"), "v2103 202207051755 ");
  EXPECT_EQ(Further("\\fBlsof\\fR \\f(CWgetName\\fR \\s-1POSIX\\s0"), "lsof getname get name posix ");
}

TEST(CodesTest, PlainTextAndTablesHaveNoFurtherWords) {
  for (const char* text :
       {"The Quick McX mp3 a1b2c3d4e5f6", "aGVsbG8gd29ybGQhCg", "0.123456 3.14 12,50 17:55:03", "12 34",
        "414.968 390.35 414.774 390.281", "1,2,3,45,678,9", "id,2022,07,1.5,33", "open(2) close(2)",
        "Stra\xC3\x9F"
        "e12 in 1999, to 2000"}) {
    EXPECT_EQ(Further(text), "") << text;
  }
  std::string row;
  for (int i = 100; i < 200; ++i) row += std::to_string(i) + " ";
  EXPECT_EQ(Further(row), "") << "too long to be a code";
  for (const char* text : {"", "fox", "12345", "AB-1234 and more", "a-b", "2022-07-05,"}) {
    EXPECT_EQ(Joined(text), text[0] == '2' ? "20220705" : "") << text;
  }
}

}  // namespace
}  // namespace ferrox::engine
