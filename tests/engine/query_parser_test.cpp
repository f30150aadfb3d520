// Catches queries read as something else than what people mean by them, and refusals without their place and remedy.
#include <stdlib.h>
#include <time.h>

#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "common/error.h"
#include "services/kovaelasticd/query/asked_fields.h"
#include "services/kovaelasticd/query/query.h"

namespace ferrox::engine {
namespace {

constexpr int64_t kNow = 1718000000;  // 2024-06-10 06:13:20 UTC, a Monday

class QueryParserTest : public testing::Test {
 protected:
  void SetUp() override {
    (void)setenv("TZ", "UTC", 1);
    tzset();
  }
  /// The tree, or "! " and the refusal without "query, ".
  static std::string Read(const std::string& text, std::vector<std::string>* hints = nullptr) {
    try {
      return PrintQuery(ParseQuery(text, kNow, hints));
    } catch (const Error& error) {
      EXPECT_EQ(error.Code(), Error::kEngineBadRequest);
      return "! " + std::string(error.what()).substr(7);
    }
  }
};

/// Each row of queries.tsv: a query, with ⏎ for the end of a line; how it is read, or what it is refused with; and what
/// the hints have. "…" stands for whatever follows; no hint means none.
TEST_F(QueryParserTest, QueriesAreReadAsTheyAreMeant) {
  const auto begins = [](const std::string& text, std::string expected) {
    const size_t open = expected.find("…");
    return open == expected.npos ? text == expected : text.starts_with(expected.substr(0, open));
  };
  std::ifstream rows(FERROX_TEST_DATA "/queries.tsv");
  size_t count = 0;
  for (std::string row; std::getline(rows, row); ++count) {
    std::istringstream columns(row);
    std::string query, expected, hint;
    std::getline(std::getline(std::getline(columns, query, '\t'), expected, '\t'), hint);
    for (size_t at = query.find("⏎"); at != query.npos; at = query.find("⏎")) query.replace(at, 3, "\n");
    std::vector<std::string> hints;
    const std::string read = Read(query, &hints);
    EXPECT_TRUE(begins(read, expected)) << row << "\n  is " << read;
    std::string told;
    for (const std::string& sentence : hints) told += sentence + "; ";
    EXPECT_EQ(told.empty(), hint.empty()) << row << "\n  " << told;
    EXPECT_NE(told.find(hint), told.npos) << row << "\n  " << told;
  }
  EXPECT_GT(count, 200U);
}

TEST_F(QueryParserTest, WhatIsTooMuch) {
  EXPECT_EQ(Read(std::string("a\0b", 3)), "! character 1: the query holds a NUL byte; leave it out");
  EXPECT_NE(Read(std::string(kQueryMaxDepth + 1, '(')).find("nested deeper than 16; simplify"), std::string::npos);
  EXPECT_NE(Read(std::string(kQueryMaxDepth + 1, '(') + "a").find("nested deeper"), std::string::npos);
  std::string text;
  while (text.size() <= 10000) text += "w ";
  std::vector<std::string> hints;
  EXPECT_EQ(ParseQuery(text, kNow, &hints).children.size(), kQueryMaxBytes / 2);
  EXPECT_EQ(hints.at(0), "only the first 4096 bytes of the query are looked for");
  for (const char* condition : {" kind:other", " (a b)"}) {
    std::string many;
    for (size_t i = 0; i <= kQueryMaxTerms; ++i) many += condition;
    EXPECT_NE(Read(many).find("leave some out"), std::string::npos);
  }
}

TEST_F(QueryParserTest, FieldsThatAreAskedForAreTold) {
  std::string told;
  const QueryNode query =
      ParseQuery("lisbon camera:nikon (taken:2023 OR camera:canon) KOVAMDLyricist:x -artist:y ext:jpg", kNow);
  for (const AskedFields& asked : FieldsAskedFor(query)) told += asked.name + "=" + asked.fields[0] + " ";
  EXPECT_EQ("camera=KOVAMDAcquisitionMake taken=KOVAMDContentCreationDate KOVAMDLyricist=KOVAMDLyricist ", told);
}

}  // namespace
}  // namespace ferrox::engine
