// Catches what a hostile worker could make the daemon believe, or copy, by its answer.
#include "services/kovacontentextractd/answer.h"

#include <unistd.h>

#include <string>
#include <string_view>
#include <vector>

#include <gtest/gtest.h>

#include "base/unique_fd.h"
#include "common/json_util.h"
#include "services/kovacontentextractd/readers/utf8.h"
#include "services/kovacontentextractd/region.h"

namespace ferrox::test {
namespace {

using extract::ParseAnswer;

TEST(AnswerTest, OnlyWhatAFilesContentMaySayIsTaken) {
  const struct {
    const char* json;
    const char* taken;
  } rows[] = {
      {R"({"KOVAMDTitle":"T","_KOVATextCut":true})", R"({"KOVAMDTitle":"T","_KOVATextCut":true})"},
      {R"({"KOVAMDPath":"/etc","KOVAMDOwnerUserID":"0","KOVAMDIsDir":true,"KOVAMDFSSize":1})", "{}"},
      {R"({"_KOVAStamp":"x","_KOVANeedMeta":false,"_KOVAExtractVersion":9,"bogus":1})", "{}"},
      {R"({"KOVAMDTextContent":"not here"})", "{}"},
      {R"({"KOVAMDTitle":"\udfff","KOVAMDAlbum":"\u00e4\ud83d\ude00"})",
       "{\"KOVAMDAlbum\":\"\xc3\xa4\xf0\x9f\x98\x80\"}"},
      {R"({"KOVAMDRecordingYear":"1984","KOVAMDTitle":[1],"KOVAMDAlbum":{"a":1},"KOVAMDComment":null})", "{}"},
      {R"({"KOVAMDRecordingYear":1984,"KOVAMDDurationSecond":3,"KOVAMDPixelWidth":640,"KOVAMDISOSpeed":1.5})",
       R"({"KOVAMDDurationSecond":3.0,"KOVAMDPixelWidth":"640","KOVAMDRecordingYear":1984})"},
  };
  std::vector<extract::AttachedBytes> attachments;
  for (const auto& row : rows) {
    Json::Value fields(Json::objectValue);
    EXPECT_TRUE(ParseAnswer(row.json, fields, attachments)) << row.json;
    EXPECT_EQ(row.taken, toString(fields)) << row.json;
  }
  Json::Value fields(Json::objectValue);
  const std::string title(100000, 'x');
  EXPECT_TRUE(ParseAnswer("{\"KOVAMDTitle\":\"" + title + "\"}", fields, attachments));
  EXPECT_EQ("{}", toString(fields)) << "longer than any title is";
}

TEST(AnswerTest, WhatIsNoAnswerIsRefused) {
  const std::string deep = std::string(100000, '[') + std::string(100000, ']');
  const std::string nested = "{\"KOVAMDTitle\":" + deep + "}";
  std::string many = "{\"KOVAMDTitle\":[0";
  for (int i = 0; i < 5000; ++i) many += ",0";
  const std::string rows[] = {
      many + "]}", "", "x", "[]", "null", "{", "{}{}", deep, nested, "{\"KOVAMDTitle\":\"\xff\"}", "{}\xff"};
  std::vector<extract::AttachedBytes> attachments;
  for (const std::string& row : rows) {
    Json::Value fields(Json::objectValue);
    EXPECT_FALSE(ParseAnswer(row, fields, attachments)) << row.substr(0, 40) << " of " << row.size();
    EXPECT_TRUE(fields.empty());
  }
}

TEST(AnswerTest, AttachmentsLieBehindEachOtherInTheRegion) {
  const auto listed = [](const std::string& list) {
    Json::Value fields(Json::objectValue);
    std::vector<extract::AttachedBytes> attachments;
    EXPECT_TRUE(ParseAnswer("{\"attachments\":" + list + "}", fields, attachments)) << list;
    EXPECT_TRUE(fields.empty()) << list;
    std::string text;
    for (const auto& one : attachments) {
      text += one.name + " " + std::to_string(one.offset) + "+" + std::to_string(one.bytes) + "\n";
    }
    return text;
  };
  EXPECT_EQ("a.pdf 1048576+10\nb 1048586+5\n", listed(R"([{"name":"a.pdf","bytes":10},{"name":"b","bytes":5}])"));
  EXPECT_EQ("a 1048576+15728640\n", listed(R"([{"name":"a","bytes":15728640},{"name":"b","bytes":1}])"));
  const std::string long_name(2000, 'x');
  for (const std::string first : {R"({"name":"a","bytes":15728641})", R"({"name":"a","bytes":-1})", R"({"bytes":1})",
                                  R"({"name":1,"bytes":1})", "7"}) {
    EXPECT_EQ("", listed("[" + first + R"(,{"name":"b","bytes":1}])")) << first;
  }
  EXPECT_EQ("", listed("[{\"name\":\"" + long_name + "\",\"bytes\":1}]"));
  EXPECT_EQ("", listed(R"({"name":"a","bytes":1})"));
}

/// A worker's region that holds `text` at its beginning.
base::UniqueFd RegionWith(const std::string& text) {
  base::UniqueFd region = extract::MakeRegion();
  EXPECT_EQ(static_cast<ssize_t>(text.size()), pwrite(region.Get(), text.data(), text.size(), 0));
  return region;
}

TEST(AnswerTest, TextIsHandedOnInWholeCharacters) {
  std::string text;
  for (int i = 0; i < 100000; ++i) text += "a\u00e4\u4e2d";
  std::string copied;
  const base::UniqueFd region = RegionWith(text);
  EXPECT_TRUE(extract::CopyText(region.Get(), text.size(), [&copied](size_t offset, std::string_view piece) {
    EXPECT_EQ(copied.size(), offset);
    EXPECT_EQ(piece.size(), extract::ValidUtf8Prefix(piece));
    copied += piece;
  }));
  EXPECT_EQ(text, copied);
  const auto take = [](size_t, std::string_view) {};
  EXPECT_TRUE(extract::CopyText(region.Get(), 0, take));
  EXPECT_FALSE(extract::CopyText(region.Get(), 2, take)) << "half a character at the end";
  EXPECT_FALSE(extract::CopyText(region.Get(), (1 << 20) + 1, take)) << "longer than a text may be";
  EXPECT_FALSE(extract::CopyText(RegionWith("a\xff" + std::string(100000, 'b')).Get(), 100002, take));
  EXPECT_NE(0, ftruncate(region.Get(), 0)) << "the size is not for the worker to change";
}

}  // namespace
}  // namespace ferrox::test
