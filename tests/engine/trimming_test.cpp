// Catches searches that show an ordinary user a document which they may not read, miss one which they may, or tell by
// anything else in the reply (totals, scores, order, snippets, suggestions) what others have.
#include <map>
#include <random>
#include <sstream>

#include <gtest/gtest.h>

#include "base/path.h"
#include "common/json_util.h"
#include "services/kovaelasticd/store/access_check.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

constexpr char kRoot[] = "/v/share";
const Asker kAsker = {50001, {50001, 50005}, kRoot};
const char* const kRecords[] = {"0:0:0755",
                                "0:0:0755",
                                "50001:0:0500",
                                "0:50005:0050",
                                "0:0:0711",
                                "0:0:0744",
                                "0:50005:0705",
                                "50001:0:0077",
                                "0:0:0770:u50001=5,g=0",
                                "0:0:0700",
                                "0:0:0705:u50001=7,g=0",
                                ""};

bool Gives(const std::string& access, uint8_t permission) {
  const auto record = base::ParseAccess(access);
  return record.has_value() && (PermissionsOf(*record, kAsker) & permission) != 0;
}

struct File {
  Json::Value document;
  std::string access;
};
using Files = std::map<std::string, File>;

/// Whether the asker may read a document, by the records of the folders on its way.
bool IsReadable(const Files& files, const std::string& path) {
  if (!base::IsAtOrBelow(path, kRoot) || !Gives(files.at(path).access, kMayRead)) return false;
  for (std::string folder = path; folder != kRoot;) {
    folder = folder.substr(0, folder.rfind('/'));
    if (!Gives(files.at(folder).access, kMayEnter)) return false;
  }
  return true;
}

class RandomFiles {
 public:
  explicit RandomFiles(uint32_t seed) : random_(seed) {}
  size_t Below(size_t most) { return random_() % most; }
  std::string Text(size_t words) {
    static const char* const kWords[] = {"alpha", "alpha", "beta", "gamma", "delta", "bridge", "bridges", "omega"};
    std::string text;
    for (size_t i = Below(words + 1); i > 0; --i) text += std::string(kWords[Below(std::size(kWords))]) + " ";
    return text;
  }
  File Make(const std::string& path, bool is_folder, const std::string& access) {
    const int64_t date = 1600000000 + static_cast<int64_t>(Below(4)) * 1000000;
    File file{FileDocument(path, is_folder ? "" : Text(6), date), access};
    file.document["KOVAMDIsDir"] = is_folder;
    file.document["KOVAMDTitle"] = Below(40) == 0 ? "bridge" : "";
    file.document["_KOVAStamp"] = "1.2.3." + std::to_string(Below(1 << 30));
    if (!access.empty()) file.document["_KOVAAccess"] = access;
    return file;
  }
  std::string Access() { return kRecords[Below(std::size(kRecords))]; }

  Files Tree(size_t count) {
    Files files = {{kRoot, Make(kRoot, true, "0:0:0755")}, {"/v", Make("/v", true, "0:0:0700")}};
    std::vector<std::string> folders = {kRoot};
    while (files.size() < count) {
      const bool is_folder = Below(30) == 0, is_beside = Below(100) == 0;
      const std::string path = (is_beside ? "/v" : folders[Below(folders.size())]) + "/" +
                               (is_folder ? "folder" : "alpha") + std::to_string(files.size() % 700) + ".txt";
      if (files.count(path) == 0 && is_folder && !is_beside) folders.push_back(path);
      files.emplace(path, Make(path, is_folder, Below(3) == 0 ? Access() : is_folder ? "0:0:0755" : "0:0:0644"));
    }
    return files;
  }

  template <typename List>
  void Shuffle(List& list) {
    std::shuffle(list.begin(), list.end(), random_);
  }

 private:
  std::mt19937 random_;
};

std::string ReplyText(const SearchReply& reply) {
  std::ostringstream text;
  text << std::hexfloat << reply.total << (reply.ranking_bounded ? " bounded" : "") << "\n";
  for (const SearchHit& hit : reply.hits) {
    text << hit.path << "|" << hit.score << "|" << hit.number_key << "|" << hit.name_key << "|" << hit.snippet << "|"
         << hit.stamp << "|" << hit.is_folder << "|" << toString(hit.fields) << "\n";
  }
  for (const std::string& word : reply.suggestions) text << "? " << word << "\n";
  for (const std::string& word : reply.ignored) text << "- " << word << "\n";
  for (const RepairedWord& word : reply.repaired) text << word.from << " > " << word.to << word.also << "\n";
  text << reply.total_all.value_or(-1) << reply.none_has_all;
  return text.str();
}

const std::vector<std::string> kQueries = {"alpha",
                                           "date:>1990",
                                           "bridge",
                                           "alpha beta",
                                           "alpha OR gamma",
                                           "-alpha",
                                           "\"alpha beta\"",
                                           "brid*",
                                           "title:bridge",
                                           "name:alpha1",
                                           "ext:txt -beta",
                                           "kind:folder",
                                           "size:>20",
                                           "date:>2020",
                                           "path:/v/share",
                                           "path:/v",
                                           "secret",
                                           "alpha -path:/v/share/folder1.txt",
                                           "gamma*",
                                           "alfa",
                                           "omega size:0..30",
                                           "bridgs",
                                           "secre",
                                           "alpha (beta OR secret)",
                                           "alpha bridge secret",
                                           "bridge alhpa omega"};

class TrimmingTest : public testing::Test {
 protected:
  struct Index {
    test::TempDir folder;
    SqliteStore store{folder / "index.sqlite", true, PlainSchema()};
  };
  static SearchReply Ask(IndexStore& store, const std::string& query, SearchRequest request = {}) {
    request.asker = &kAsker;
    return Find(store, query, request);
  }
  static void Put(IndexStore& store, const Files& files, const std::vector<std::string>& paths) {
    for (const std::string& path : paths) store.Upsert(path, files.at(path).document);
  }
};

TEST_F(TrimmingTest, RepliesAreAFunctionOfWhatTheAskerMayRead) {
  RandomFiles random(14);
  const Files files = random.Tree(9000);
  std::vector<std::string> readable, others;
  for (const auto& [path, file] : files) (IsReadable(files, path) ? readable : others).push_back(path);
  ASSERT_GT(readable.size(), 5500U);
  ASSERT_GT(others.size(), 500U);
  Index plain, changed;
  std::vector<std::string> all = readable;
  for (const std::string& path : others) {
    if (files.at(path).document["KOVAMDIsDir"].asBool()) all.push_back(path);
  }
  random.Shuffle(all);
  Put(plain.store, files, all);
  plain.store.Commit();

  // The other index gets the same by a longer way, among other files, with searches on the way.
  std::vector<std::string> order = all;
  order.insert(order.end(), others.begin(), others.end());
  random.Shuffle(order);
  for (size_t i = 0; i < order.size(); ++i) {
    Json::Value document = files.at(order[i]).document;
    if (i % 7 == 0) document["_KOVAAccess"] = i % 2 == 0 ? "0:0:0700" : "0:0:0777";
    if (!IsReadable(files, order[i]) && !document["KOVAMDIsDir"].asBool()) {
      document["KOVAMDTextContent"] = "secret secret brdiges alpha omega " + random.Text(200);
    }
    changed.store.Upsert(order[i], document);
    if (i % 50 == 0) changed.store.Upsert("/v/share/gone/" + std::to_string(i), FileDocument("/gone", "alpha"));
    if (i % 1500 != 0) continue;
    changed.store.Commit();
    (void)Ask(changed.store, "alpha");
  }
  changed.store.DeletePrefix("/v/share/gone/");
  changed.store.Commit();
  (void)Ask(changed.store, "alpha");
  for (const std::string& path : order) {
    Json::Value access;
    access["_KOVAAccess"] = files.at(path).access.empty() ? Json::Value() : Json::Value(files.at(path).access);
    changed.store.Set(path, access);
  }
  changed.store.Commit();

  SearchRequest every;
  every.limit = 100000;
  std::string expected;
  for (const std::string& path : readable) expected += (expected.empty() ? "" : "\n") + path;
  ASSERT_EQ(expected, Paths(Ask(changed.store, "date:>1990", every)));
  for (const std::string& query : kQueries) {
    for (int variant = 0; variant < 8; ++variant) {
      SearchRequest request;
      request.sort = static_cast<SortKey>(variant % 4);
      request.ascending = random.Below(3) == 0;
      request.offset = static_cast<int64_t>(random.Below(3) * random.Below(1200));
      request.limit = 1 + static_cast<int64_t>(random.Below(40));
      request.ranked_max = variant < 5 ? 200000 : 5 + random.Below(700);
      const std::string reply = ReplyText(Ask(changed.store, query, request));
      ASSERT_EQ(ReplyText(Ask(plain.store, query, request)), reply) << query << ", variant " << variant;
      ASSERT_EQ(reply.npos, reply.find("secret")) << query;
    }
  }
  // Only the rights of documents change, so that most of what was known stays.
  std::erase_if(readable, [&](const std::string& path) {
    if (files.at(path).document["KOVAMDIsDir"].asBool() || random.Below(100) != 0) return false;
    const std::string stamp = files.at(path).document["_KOVAStamp"].asString();
    EXPECT_TRUE(changed.store.SetAccess({{path, stamp, "0:0:0700"}}).missing.empty());
    return true;
  });
  changed.store.Commit();
  EXPECT_EQ(std::ssize(readable), Ask(changed.store, "date:>1990").total);
  EXPECT_EQ(0, Ask(changed.store, "secret").total);
  const SearchReply near = Ask(changed.store, "brdiges");
  ASSERT_FALSE(near.repaired.empty());
  for (const RepairedWord& word : near.repaired) EXPECT_TRUE(word.to.starts_with("bridge")) << word.to;
  EXPECT_EQ(Ask(changed.store, "\"brdiges\"").suggestions, (std::vector<std::string>{"bridges", "bridge"}));
  EXPECT_GT(Find(changed.store, "secret").total, 500);
}

TEST_F(TrimmingTest, WhatHangsOnNothingIsClosed) {
  Index index;
  for (const char* path : {"/v/share", "/v/share/a", "/v/share/a/b"}) {
    index.store.Upsert(path, RandomFiles(1).Make(path, true, "0:0:0755").document);
  }
  const std::string file = "/v/share/a/b/alpha.txt";
  index.store.Upsert(file, RandomFiles(1).Make(file, false, "0:0:0644").document);
  index.store.Commit();
  EXPECT_EQ(1, Ask(index.store, "name:alpha").total);
  for (const char* root : {"", "v/share", "/v/shar", "/v/share/a/b/c", "/w"}) {
    const Asker elsewhere = {0, {0}, root};
    SearchRequest request;
    request.asker = &elsewhere;
    EXPECT_EQ(0, Find(index.store, "date:>1990", request).total) << root;
  }
  {
    Database database(index.folder / "index.sqlite", Database::Mode::kWrite);
    database.Execute("UPDATE folders SET parent = (SELECT id FROM folders WHERE name = 'b/') WHERE name = 'a/'");
    database.Execute("DROP TABLE locations");
  }
  SqliteStore damaged(index.folder / "index.sqlite", false, PlainSchema());
  EXPECT_EQ(0, Ask(damaged, "name:alpha").total) << "the folders above it are a circle";
}

}  // namespace
}  // namespace ferrox::engine
