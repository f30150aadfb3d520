#include "services/kovacontentextractd/answer.h"

#include <string>

#include <gtest/gtest.h>

#include "common/json_util.h"

namespace ferrox::test {
namespace {

using namespace std::literals;
using extract::Answer;
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
      {R"({"KOVAMDRecordingYear":"1984","KOVAMDTitle":[1],"KOVAMDAlbum":{"a":1},"KOVAMDComment":null})", "{}"},
      {R"({"KOVAMDRecordingYear":1984,"KOVAMDDurationSecond":3,"KOVAMDPixelWidth":640,"KOVAMDISOSpeed":1.5})",
       R"({"KOVAMDDurationSecond":3.0,"KOVAMDPixelWidth":"640","KOVAMDRecordingYear":1984})"},
  };
  for (const auto& row : rows) {
    Answer answer;
    EXPECT_TRUE(ParseAnswer(row.json, answer)) << row.json;
    EXPECT_EQ(row.taken, toString(answer.fields)) << row.json;
  }
  Answer answer;
  EXPECT_TRUE(ParseAnswer("{}\0text\0more"s, answer));
  EXPECT_EQ("text\0more"s, answer.text);
  const std::string title(100000, 'x');
  EXPECT_TRUE(ParseAnswer("{\"KOVAMDTitle\":\"" + title + "\"}", answer));
  EXPECT_EQ("{}", toString(answer.fields)) << "longer than any title is";
}

TEST(AnswerTest, WhatIsNoAnswerIsRefused) {
  const std::string deep = std::string(100000, '[') + std::string(100000, ']');
  const std::string nested = "{\"KOVAMDTitle\":" + deep + "}";
  const std::string long_text = "{}" + std::string(1, '\0') + std::string((1 << 20) + 1, 'x');
  const std::string rows[] = {"",          "x",       "[]",
                              "null",      "{",       "{}{}",
                              deep,        nested,    "{\"KOVAMDTitle\":\"\xff\"}",
                              "{}\0\xff"s, long_text, "{\"a\":\"" + std::string(3 << 20, 'x') + "\"}"};
  for (const std::string& row : rows) {
    Answer answer;
    EXPECT_FALSE(ParseAnswer(row, answer)) << row.substr(0, 40) << " of " << row.size();
    EXPECT_TRUE(answer.fields.empty() && answer.text.empty());
  }
}

}  // namespace
}  // namespace ferrox::test
