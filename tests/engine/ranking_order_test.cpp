// Catches a rule of the ranking that no longer decides: for each, a small collection and the order that must come.
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

struct Ranked {
  const char* rule;
  const char* query;
  /// Path and text, the best first; what stands behind kNotFound must not be found.
  std::vector<std::pair<std::string, std::string>> documents;
};

constexpr char kNotFound[] = "-";
constexpr int kFillers = 60;
/// What texts of one line go on with, so that they have a language, and no title.
const std::string kRest =
    " was seen by the people who live in the old house on the hill, which they had built after the great war, and so"
    " it was written down in the books that are kept there";

const std::string kGerman = "Das haben wir in dem alten Haus am Berg gefunden, und dann wurde es aufgeschrieben: ";

const Ranked kRules[] = {
    {"the word as it is written comes before its other forms",
     "licences",
     {{"/v/b", "the licences are here"}, {"/v/a", "the licence is here"}}},
    {"a word more often in a text counts more",
     "tunnel",
     {{"/v/b", "tunnel tunnel tunnel"}, {"/v/a", "tunnel and a hill"}}},
    {"a word in a short text counts more", "tunnel", {{"/v/b", "small tunnel"}, {"/v/a", "small tunnel" + kRest}}},
    {"a name that is the word comes before a text with it",
     "tunnel",
     {{"/v/tunnel.txt", "no"}, {"/v/a.txt", "tunnel"}}},
    {"a name that is the word comes before one with others",
     "tunnel",
     {{"/v/z/tunnel.txt", "no"}, {"/v/a/tunnel below harbour.txt", "no"}}},
    {"a whole word of a name comes before a part of one", "port", {{"/v/z port.txt", "no"}, {"/v/airport.txt", "no"}}},
    {"a title comes before the text",
     "tunnel",
     {{"/v/b.md", "# Tunnel\n\nIt was dug by hand."}, {"/v/a.md", "# Hills\n\nA tunnel was dug."}}},
    {"a rare word decides before a frequent one",
     "lantern harbour",
     {{"/v/z", "lantern"}, {"/v/a", "harbour"}, {"/v/b", "harbour "}, {"/v/c", "harbour  "}}},
    {"all words come before some",
     "lantern harbour",
     {{"/v/z", "lantern, then harbour"}, {"/v/a", "lantern lantern lantern"}}},
    {"words side by side come before words apart",
     "lantern harbour",
     {{"/v/z", "lantern harbour"}, {"/v/a", "lantern" + kRest + " harbour"}}},
    {"words in the order of the query come before others",
     "lantern harbour",
     {{"/v/z", "a lantern harbour"}, {"/v/a", "a harbour lantern"}}},
    {"the name of a folder above counts",
     "invoices globex",
     {{"/v/z/invoices/globex.txt", "no"}, {"/v/a/letters/globex.txt", "no"}}},
    {"the name of a folder counts less than the file's own",
     "invoices",
     {{"/v/z/letters/invoices.txt", "no"}, {"/v/a/invoices/globex.txt", "no"}}},
    {"the name of a folder is enough for a required word",
     "+invoices +globex",
     {{"/v/z/invoices/globex.txt", "no"}, {kNotFound, ""}, {"/v/a/letters/globex.txt", "no"}}},
    {"and for one in parentheses",
     "globex (invoices OR bills)",
     {{"/v/bills/globex.txt", "no"}, {kNotFound, ""}, {"/v/a/letters/globex.txt", "no"}}},
    {"but not for one in quotes",
     "\"invoices\" globex",
     {{"/v/z/globex.txt", "invoices"}, {kNotFound, ""}, {"/v/invoices/globex.txt", "no"}}},
    {"nor does it exclude",
     "globex -invoices",
     {{"/v/invoices/globex.txt", "no"}, {kNotFound, ""}, {"/v/z/globex.txt", "invoices"}}},
    {"a required word excludes, others do not",
     "lantern +harbour",
     {{"/v/z", "lantern harbour"}, {kNotFound, ""}, {"/v/b", "harbour"}, {"/v/a", "lantern"}}},
    {"quotes want the word as it is written",
     "\"licences\"",
     {{"/v/z", "licences"}, {kNotFound, ""}, {"/v/a", "licence"}}},
    {"a typo finds what was meant", "lantrrn", {{"/v/z", "lantern"}}},
    {"a frequent word finds none beside a rarer one",
     "filler lantern",
     {{"/v/z", "lantern"}, {kNotFound, ""}, {"/v/a", "filler"}}},
    {"but it counts", "filler lantern", {{"/v/z", "lantern, filler"}, {"/v/a", "lantern, fuller"}}},
    {"an umlaut written out comes behind the word as typed", "mueller", {{"/v/z", "Mueller"}, {"/v/a", "Müller"}}},
    {"a synonym comes behind the word itself", "car", {{"/v/z", "a car"}, {"/v/a", "an automobile"}}},
    {"forms of a synonym count", "car red", {{"/v/z", "red automobiles"}, {"/v/a", "red bridges"}}},
    {"a synonym may be a phrase, and stand for one",
     "hard disk",
     {{"/v/z", "a hard disk"}, {"/v/a", "a drive"}, {kNotFound, ""}, {"/v/b", "a motor"}}},
    {"it holds one way", "drive", {{"/v/z", "a drive"}, {kNotFound, ""}, {"/v/a", "a hard disk"}}},
    {"a required word has none", "+car", {{"/v/z", "a car"}, {kNotFound, ""}, {"/v/a", "an automobile"}}},
    {"a synonym that nearly all have does not drown the word",
     "rare harbour",
     {{"/v/z", "rare"}, {"/v/a", "harbour"}, {kNotFound, ""}, {"/v/b", "no"}}},
    {"a compound comes behind the word itself",
     "Kündigung",
     {{"/v/z", kGerman + "Die Kündigung\n"}, {"/v/a", kGerman + "Kündigungsfrist und Frist, Kündigungsfrist\n"}}},
    {"the last part of a compound finds it",
     "Frist",
     {{"/v/z", kGerman + "Frist\n"}, {"/v/a", kGerman + "Kündigungsfristen nach Kündigung\n"}}},
    {"English has no compounds", "cargo", {{"/v/z", "cargo"}, {kNotFound, ""}, {"/v/a", "cargoship, a ship"}}},
    {"an article is a part of the word in Arabic",
     "كتاب",
     {{"/v/z", "كتاب"}, {"/v/y", " كتاب"}, {"/v/x", "  كتاب"}, {"/v/a", "الكتاب"}}},
    {"a code grouped otherwise is found",
     "AB1234/5",
     {{"/v/a", "file AB-1234/5"}, {kNotFound, ""}, {"/v/b", "file AB 1235"}}},
    {"words are found within identifiers", "ranked width", {{"/v/z", "int ranked_width = 1;"}, {"/v/a", "width"}}},
    {"the newer of two comes first", "lantern", {{"/v/z new", "lantern"}, {"/v/a old", "lantern"}}},
    {"what lies less deep comes first", "lantern", {{"/v/z", "lantern"}, {"/v/a/b/c/d/e/a", "lantern"}}},
    {"backups come last", "lantern", {{"/v/z/x/y", "lantern"}, {"/v/backup/y", "lantern"}}},
    {"a word for a kind prefers it", "lantern photo", {{"/v/z lantern.jpg", "no"}, {"/v/a lantern.txt", "no"}}},
    {"a kind decides less than a word",
     "lantern harbour photo",
     {{"/v/z lantern harbour.txt", "no"}, {"/v/a lantern.jpg", "no"}}},
    {"equals come by path", "lantern", {{"/v/a", "lantern"}, {"/v/b", "lantern"}, {"/v/c", "lantern"}}},
};

/// Below folders that have documents of their own.
class RankingOrderTest : public testing::Test {
 protected:
  RankingOrderTest() {
    for (int i = 0; i < kFillers; ++i) Put("/v/others/" + std::to_string(i), "filler " + std::to_string(i));
  }
  void Put(const std::string& path, const std::string& text) {
    for (size_t end = path.find('/', 1); end != path.npos; end = path.find('/', end + 1)) {
      Json::Value folder = FileDocument(path.substr(0, end));
      folder["KOVAMDIsDir"] = true;
      store_.Upsert(path.substr(0, end), folder);
    }
    const int64_t mtime = path.find("new") != path.npos ? 1717900000 : 1500000000;
    store_.Upsert(path, FileDocument(path, text.find('\n') == text.npos ? text + kRest : text, mtime));
  }
  std::string Found(const char* query) {
    SearchRequest request;
    request.synonyms = &synonyms_;
    SearchReply reply = Find(store_, query, request);
    std::erase_if(reply.hits, [](const SearchHit& hit) { return hit.is_folder; });
    return Paths(reply, false);
  }

  const Synonyms synonyms_{
      {{{"Car", "automobile"}, {"automobile", "car"}}, {{"hard disk"}, {"drive"}}, {{"rare"}, {"filler"}}}};
  test::TempDir folder_;
  SqliteStore store_{folder_ / "index.sqlite", true, PlainSchema()};
};

TEST_F(RankingOrderTest, EachRuleDecides) {
  for (const Ranked& rule : kRules) {
    std::string expected;
    bool is_found = true;
    for (const auto& [path, text] : rule.documents) {
      is_found = is_found && path != kNotFound;
      if (is_found) expected += (expected.empty() ? "" : "\n") + path;
    }
    for (auto document = rule.documents.rbegin(); document != rule.documents.rend(); ++document) {
      if (document->first != kNotFound) Put(document->first, document->second);
    }
    store_.Commit();
    EXPECT_EQ(Found(rule.query), expected) << rule.rule << ": " << rule.query;
    for (const auto& [path, text] : rule.documents) store_.DeletePrefix(path.substr(0, path.find('/', 3)));
  }
}

}  // namespace
}  // namespace ferrox::engine
