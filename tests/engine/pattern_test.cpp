// Catches "*" and "?" that find other names and words than they say, or tell of documents that may not be read.
#include "services/kovaelasticd/text/pattern.h"

#include <string>

#include <gtest/gtest.h>

#include "services/kovaelasticd/store/sqlite_store.h"
#include "services/kovaelasticd/text/fold.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

const Asker kReader = {50001, {50001}, "/v/"};

TEST(PatternTest, NamesMatchFromEdgeToEdgeOfWords) {
  const struct {
    const char* pattern;
    const char* names;  // that match, with "|" between them
    const char* others;
  } kRows[] = {
      {"rep*t", "report.pdf|Old Report|repeat|REP-cat", "reports|prepart|rep.pdf"},
      {"contr?ct", "contract|my contrÄct 2|contr.ct", "contraact|contracts|contrct"},
      {"*port", "report|airport.txt|port", "ports|portal"},
      {"*port*", "report|transports", "por"},
      {"report*2024", "report_final_2024.pdf|report2024", "report_20245|2024 report"},
      {"img_20??.jpg", "IMG_2024.JPG|x img_20ab.jpg", "img_204.jpg|img_2024.jpeg"},
      {"*.tar.gz", "a.tar.gz|.tar.gz", "a.tar.gzip|a.tar"},
      {"a*b*a*b*c", "aXbYaXbYc|abababababab abc", "abababababab ab"},
      {"ma?tre", "maître|ma😀tre", "matre"},
  };
  for (const auto& row : kRows) {
    for (const bool matches : {true, false}) {
      std::string names = matches ? row.names : row.others;
      for (size_t begin = 0; begin <= names.size();) {
        const size_t end = std::min(names.size(), names.find('|', begin));
        const std::string name = names.substr(begin, end - begin);
        EXPECT_EQ(Pattern(row.pattern).MatchesName(FoldText(name)), matches) << row.pattern << " " << name;
        begin = end + 1;
      }
    }
  }
  EXPECT_TRUE(Pattern("l?c*se").MatchesWord("license"));
  EXPECT_FALSE(Pattern("l?c*se").MatchesWord("licenses"));
}

class PatternSearchTest : public testing::Test {
 protected:
  static void Put(IndexStore& store, const std::string& path, const std::string& text, bool readable) {
    Json::Value document = FileDocument(path, text);
    document["_KOVAAccess"] = readable ? "0:0:0644" : "0:0:0600";
    store.Upsert(path, document);
  }
  static void PutRoot(IndexStore& store) {
    Json::Value root = FileDocument("/v");
    root["KOVAMDIsDir"] = true;
    root["_KOVAAccess"] = "0:0:0755";
    store.Upsert("/v", root);
  }
  static SearchReply Ask(IndexStore& store, const std::string& query, const Asker* asker) {
    SearchRequest request;
    request.asker = asker;
    request.limit = 1000;
    return Find(store, query, request);
  }

  test::TempDir folder_;
  SqliteStore store_{folder_ / "index.sqlite", true, PlainSchema()};
};

TEST_F(PatternSearchTest, NamesAndTextsAreFound) {
  PutRoot(store_);
  Put(store_, "/v/report.pdf", "the lease", true);
  Put(store_, "/v/a.txt", "we repaint the wall and repeat; mail bob.smith@example.org about AB-1", true);
  Put(store_, "/v/ab", "licence", false);
  store_.Commit();
  const struct {
    const char* query;
    const char* paths;
    const char* for_reader;
  } kRows[] = {
      {"rep*t", "/v/a.txt\n/v/report.pdf", nullptr},
      {"name:rep*t", "/v/report.pdf", nullptr},
      {"r?peat -lease", "/v/a.txt", nullptr},
      {"ab* -rep*t", "/v/ab", ""},
      {"*ab", "/v/ab", ""},
      {"lic?nce", "/v/ab", ""},
      {"*aint wall", "/v/a.txt", nullptr},
      {"title:rep*t", "", nullptr},
      {"*.pdf", "/v/report.pdf", nullptr},
      // Addresses, whole and in parts.
      {"bob.smith@example.org", "/v/a.txt", nullptr},
      {"+\"smith@example\"", "/v/a.txt", nullptr},
      {"+@example.org +bob", "/v/a.txt", nullptr},
      {"+bob@example.org", "", nullptr},
  };
  for (const auto& row : kRows) {
    EXPECT_EQ(FindPaths(store_, row.query), row.paths) << row.query;
    EXPECT_EQ(Paths(Ask(store_, row.query, &kReader)), row.for_reader == nullptr ? row.paths : row.for_reader)
        << row.query;
  }
  EXPECT_TRUE(Ask(store_, "rep*t", nullptr).hints.empty());
  EXPECT_NE(Ask(store_, "rep*20t", nullptr).hints.at(0).find("\"rep*20t\" was looked for in names alone"),
            std::string::npos);
}

TEST_F(PatternSearchTest, WhatIsHiddenMakesNoDifference) {
  SqliteStore open(folder_ / "open.sqlite", true, PlainSchema());
  for (IndexStore* store : {static_cast<IndexStore*>(&store_), static_cast<IndexStore*>(&open)}) {
    PutRoot(*store);
    std::string own, hidden;
    for (int i = 0; i < 1500; ++i) {
      const std::string tail = {static_cast<char>('a' + i / 100 % 26), static_cast<char>('a' + i / 10 % 10),
                                static_cast<char>('a' + i % 10)};
      (i % 2 == 0 ? own : hidden) += "term" + tail + "s ";
      Put(*store, "/v/file " + tail + std::to_string(i), "", i % 3 != 0);
    }
    Put(*store, "/v/own", own, true);
    if (store == &store_) Put(*store, "/v/hidden", hidden + own, false);
    store->Commit();
  }
  for (const char* query : {"term*s", "f?le*1", "*ile*", "t*rms -own", "fi??"}) {
    const SearchReply reply = Ask(store_, query, &kReader);
    const SearchReply without = Ask(open, query, &kReader);
    EXPECT_EQ(Paths(reply, false), Paths(without, false)) << query;
    EXPECT_EQ(reply.total, without.total) << query;
    EXPECT_EQ(reply.hints, without.hints) << query;
  }
  EXPECT_EQ(Ask(store_, "term*s", &kReader).total, 1);
  EXPECT_NE(Ask(store_, "term*s", &kReader).hints.at(0).find("the 500 shortest"), std::string::npos);
  EXPECT_EQ(Ask(store_, "f?le*1", &kReader).total, 100);
}

}  // namespace
}  // namespace ferrox::engine
