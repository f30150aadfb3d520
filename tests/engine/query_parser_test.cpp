// Catches queries read as something else, and refusals without their place and remedy.
#include <stdlib.h>
#include <time.h>

#include <string>

#include <gtest/gtest.h>

#include "common/error.h"
#include "services/kovaelasticd/query/asked_fields.h"
#include "services/kovaelasticd/query/query.h"

namespace ferrox::engine {
namespace {

constexpr int64_t kNow = 1718000000;  // 2024-06-10 06:13:20 UTC

class QueryParserTest : public testing::Test {
 protected:
  void SetUp() override {
    (void)setenv("TZ", "UTC", 1);
    tzset();
  }
  static std::string Print(const std::string& text) { return PrintQuery(ParseQuery(text, kNow)); }
  static std::string Refusal(const std::string& text) {
    try {
      return "accepted: " + Print(text);
    } catch (const Error& error) {
      EXPECT_EQ(error.Code(), Error::kEngineBadRequest);
      return error.what();
    }
  }
};

TEST_F(QueryParserTest, Structure) {
  const struct {
    const char* text;
    const char* tree;
  } kRows[] = {
      {"fox", "fox"},
      {"quick fox +den +\"big hole\"", "(and quick fox +den +\"big hole\")"},
      {"quick AND fox den", "(and +quick +fox +den)"},
      {"a OR b c", "(or +a (and +b +c))"},
      {"(a OR b) c", "(and (or +a +b) c)"},
      {"-a b", "(and (not a) b)"},
      {"-(a OR b)", "(not (or +a +b))"},
      {"a -\"b c\"", "(and a (not +\"b c\"))"},
      {"well-known e-mail", "(and well-known e-mail)"},
      {"or not and", "(and or not and)"},
      {"con* \"big hou\"*", "(and con* +\"big hou\"*)"},
      {"a & b - c + -- ---- (-)", "(and a b c)"},
      {"++a +(b c) +-d +kind:other", "(and +a (and +b +c) (not +d) kind:4)"},
      {"((a)) b (c name:d)", "(and +a b (and +c name:d))"},
      {"iban DE89 3704 0044 b", "(and iban [DE89 3704 0044] DE89 3704 0044 b)"},
      {"+49 (89) - 1234 +7 x1 x", "(and [+49 (89) - 1234] 49 89 1234 [+7 x1] 7 x1 x)"},
      {"+2019 b 7 AND 8", "(and +2019 +b +7 +8)"},
      {"name:report title:\"annual report\" name:*.jpg",
       "(and name:report KOVAMDTitle|KOVAMDHeadline:\"annual report\" "
       "name:.jpg)"},
      {"KOVAMDAlbum:x KOVAMDFSName:y content:z", "(and KOVAMDAlbum:x name:y KOVAMDTextContent:z)"},
      {"kind:image,folder ext:.PDF,txt", "(and kind:35 (or ext:pdf ext:txt))"},
      {"path:/volume1/photo/ path:\"/a b\"", "(and path:/volume1/photo path:/a b)"},
      {"owner:1000 owner:root", "(and KOVAMDOwnerUserID:1000 KOVAMDOwnerUserID:0)"},
      {"\"\" a \"", "!"},
      {"\"date:7d\"", "+\"date:7d\""},
      {"東京 都", "(and 東京 都)"},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.text);
    if (std::string(row.tree) == "!") {
      EXPECT_NE(Refusal(row.text).find("not closed"), std::string::npos);
    } else {
      EXPECT_EQ(Print(row.text), row.tree);
    }
  }
}

TEST_F(QueryParserTest, WhatPeoplePasteIsText) {
  const struct {
    const char* text;
    const char* tree;
    const char* hint;
  } kRows[] = {
      {"https://a.org/b?c=d(e) Re: lunch", "(and https://a.org/b?c=d(e) Re: lunch)", ""},
      {"ratio 3:2 10:30 C:\\Users std::vector name::x",
       "(and ratio [3:2 10:30] 3:2 10:30 C:\\Users std::vector name::x)", ""},
      {"From: bob\nto: ann", "(and From: bob to: ann)", ""},
      {"Date: Mon, size: big", "(and Date: Mon, size: big)", ""},
      {"author: cook size: >1k",
       "(and KOVAMDAuthors|KOVAMDCreator|KOVAMDContributors|KOVAMDComposer:cook size:1025..9223372036854775807)", ""},
      {"autor:cook", "autor:cook", "there is author:"},
      {"| a | b || c |", "(or +a +b +c)", ""},
      {"scan(1).pdf f(a b) :-) 5\"", "(and scan(1).pdf f (and +a +b) 5\")", ""},
      {"*.PDF **bold** rep*t what?!?", "(and ext:pdf bold* rep* what?!?)", "begins with rep"},
      {"*port", "port", "name:port"},
      {"filetype:pdf kind:photos,pdf", "(and ext:pdf (or ext:pdf kind:3))", ""},
  };
  for (const auto& row : kRows) {
    std::vector<std::string> hints;
    EXPECT_EQ(PrintQuery(ParseQuery(row.text, kNow, &hints)), row.tree);
    EXPECT_EQ(hints.empty(), *row.hint == '\0') << row.text;
    EXPECT_TRUE(hints.empty() || hints.back().find(row.hint) != std::string::npos) << hints.back();
  }
}

TEST_F(QueryParserTest, Ranges) {
  const std::string low = std::to_string(std::numeric_limits<int64_t>::min());
  const std::string high = std::to_string(std::numeric_limits<int64_t>::max());
  const struct {
    const char* text;
    std::string printed;
  } kRows[] = {
      {"size:700", "size:700..700"},
      {"size:>10M", "size:10485761.." + high},
      {"duration:5m", "KOVAMDDurationSecond:300..359"},
      {"duration:1h30m..", "KOVAMDDurationSecond:5400.." + high},
      {"duration:<3:25", "KOVAMDDurationSecond:" + low + "..204"},
      {"Year:1960..1969", "KOVAMDRecordingYear:1960..1969"},
      {"taken:2024-06-10", "KOVAMDContentCreationDate:1717977600..1718063999"},
      {"size:<2G", "size:" + low + "..2147483647"},
      {"size:1k..2MiB", "size:1024..2097152"},
      {"date:2024", "date:1704067200..1735689599"},
      {"date:2024-01..2024-06", "date:1704067200..1719791999"},
      {"date:>2024-01-31", "date:1706745600.." + high},
      {"date:<=2024-02", "date:" + low + "..1709251199"},
      {"date:2024-02-29", "date:1709164800..1709251199"},
      {"date:29.02.2024 modified:29/2/2024 date:2024/2/29",
       "(and date:1709164800..1709251199 "
       "date:1709164800..1709251199 date:1709164800..1709251199)"},
      {"date:<=02/2024", "date:" + low + "..1709251199"},
      {"pages>=100 size < 2G", "(and KOVAMDNumberOfPages:100.." + high + " size:" + low + "..2147483647)"},
      {"date:7d", "date:" + std::to_string(kNow - 7 * 86400) + ".." + high},
      {"date:today", "date:1717977600..1718063999"},
      {"date:yesterday", "date:1717891200..1717977599"},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.text);
    EXPECT_EQ(Print(row.text), row.printed);
  }
}

TEST_F(QueryParserTest, RefusalsNameThePlaceAndTheRemedy) {
  const struct {
    std::string text;
    const char* place;
    const char* part;
  } kRows[] = {
      {"", "character 1:", "there is nothing to look for; give"},
      {"(\xe2\x80\x94) \"!\" -?", "character 1:", "the query has no letters or digits to look for: give"},
      {"a (b", "character 3:", "add a \")\""},
      {"é \"b", "character 3:", "add a \""},
      {"a OR", "character 3:", "OR needs"},
      {"OR a", "character 1:", "OR needs"},
      {"a OR OR b", "OR needs", "add one"},
      {"a AND", "character 3:", "AND needs"},
      {"a NOT", "character 3:", "NOT needs"},
      {"name:", "character 1:", "needs a value"},
      {"size:big", "character 6:", "size:>10M"},
      {"size:99999999T", "character 6:", "size:>10M"},
      {"date:2024-13", "character 6:", "date:7d"},
      {"date:>7d", "character 6:", "date:7d"},
      {"date:3/4/2024", "character 6:", "date:2024"},
      {"date:2024-03/04", "character 6:", "date:2024"},
      {"kind:sound", "character 6:", "known are document"},
      {"duration:long", "character 10:", "write duration:>10m"},
      {"duration:3:", "character 10:", "write duration:>10m"},
      {"pages:1k", "character 7:", "write pages:>100"},
      {"ext:a,,b", "character 5:", "remove it"},
      {"path:photo", "character 6:", "begin it with /"},
      {"a b*", "character 3:", "two letters"},
      {"owner:no-such-user-here", "character 7:", "no user"},
      {"KOVAMDPath:/x", "character 1:", "use path:"},
      {std::string("a\0b", 3), "character 1:", "NUL"},
      {std::string(kQueryMaxBytes + 1, 'a'), "character 1:", "shorten it"},
      {std::string(kQueryMaxDepth + 1, '('), "nested deeper", "simplify"},
      {"-" + std::string(kQueryMaxDepth, '-') + "a", "nested deeper", "simplify"},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.text.substr(0, 40));
    const std::string refusal = Refusal(row.text);
    EXPECT_NE(refusal.find(row.place), std::string::npos) << refusal;
    EXPECT_NE(refusal.find(row.part), std::string::npos) << refusal;
  }
  std::string many = "w";
  while (many.size() + 2 <= kQueryMaxBytes) many += " w";
  EXPECT_EQ(ParseQuery(many, kNow).children.size(), kQueryMaxBytes / 2);
  for (const char* condition : {" kind:other", " (a b)"}) {
    many.clear();
    for (size_t i = 0; i <= kQueryMaxTerms; ++i) many += condition;
    EXPECT_NE(Refusal(many).find("leave some out"), std::string::npos);
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
