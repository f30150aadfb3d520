// Catches words of a query that find other documents by the names of folders than those whose paths have them, and
// folders that an ordinary user may not see, but for their names on the paths of what they may read, that change this.
#include "services/kovaelasticd/search/folder_words.h"

#include <map>
#include <random>

#include <gtest/gtest.h>

#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

const Asker kUser = {50001, {50001}, "/v/tax/"};

class FolderWordsTest : public testing::Test {
 protected:
  void Put(const std::string& path, bool is_folder, const char* mode) {
    Json::Value document = FileDocument(path);
    document["KOVAMDIsDir"] = is_folder;
    document["_KOVAAccess"] = std::string("0:0:") + mode;
    store_.Upsert(path, document);
  }
  /// The paths of the documents found, one a line. `by_places`: those are in memory already.
  std::string Named(const std::vector<std::string>& words, const Asker* asker, bool by_places, bool prefix = false) {
    HiddenDocuments hidden;
    PlacesCache places;
    ReadableCache readable;
    WordListCache known;
    StoreReader reader(file_, hidden, places, readable, known);
    reader.database.Execute("BEGIN");
    reader.Refresh();
    const Visible visible(reader, asker);
    if (by_places) (void)reader.places.Load(reader.database, visible.Version());
    std::vector<std::string> paths;
    DocumentsInFoldersNamed(reader, visible, {words, prefix}).ForEach([&](int64_t id) {
      paths.push_back(FindDocument(reader.database, reader.tree, id)->row.path + "\n");
      return true;
    });
    std::sort(paths.begin(), paths.end());
    std::string joined;
    for (const std::string& path : paths) joined += path;
    return joined;
  }

  test::TempDir folder_;
  const std::string file_ = folder_ / "index.sqlite";
  SqliteStore store_{file_, true, PlainSchema()};
};

TEST_F(FolderWordsTest, NamesCountForWhatLiesBelowAsItsPathHasThem) {
  std::mt19937 random(15);
  const char* const kNames[] = {"tax", "Tax 2021", "Old-Tax", "photos", "2021", "taxi"};
  std::map<std::string, bool> open = {{"/v/tax", true}};  // folders, and whether the user may enter them
  std::vector<std::string> folders = {"/v/tax"}, readable, all;
  Put("/v/tax", true, "0711");
  for (int i = 0; i < 400; ++i) {
    const std::string above = folders[random() % std::min(folders.size(), size_t{100})];
    const std::string path = above + "/" + kNames[random() % std::size(kNames)] + " " + std::to_string(i / 40);
    if (open.count(path) != 0) continue;
    const bool may_enter = i < 20 || random() % 4 != 0;
    Put(path, true, may_enter ? "0711" : "0700");
    open[path] = open[above] && may_enter;
    folders.push_back(path);
  }
  for (int i = 0; i < 3000; ++i) {
    const std::string above = folders[random() % folders.size()];
    Put(above + "/f" + std::to_string(i), false, "0644");
    if (open[above]) readable.push_back(above + "/f" + std::to_string(i));
  }
  store_.Commit();
  store_.Get({"", "/v/tax/", "", -1, {}}, [&](const Json::Value& d) { all.push_back(d["KOVAMDPath"].asString()); });
  std::sort(readable.begin(), readable.end());

  const auto below = [](const std::vector<std::string>& paths, const std::string& name) {
    std::string found;
    for (const std::string& path : paths) {
      const std::string folders_below = path.substr(6, path.rfind('/') - 5);  // behind "/v/tax"
      if (folders_below.find(name) != std::string::npos) found += path + "\n";
    }
    return found;
  };
  const std::pair<std::vector<std::string>, std::string> cases[] = {
      {{"tax", "2021", "3"}, "Tax 2021 3/"}, {{"old", "tax", "1"}, "Old-Tax 1/"}, {{"photos", "4"}, "photos 4/"}};
  for (const auto& [words, name] : cases) {
    for (const bool by_places : {false, true}) {
      EXPECT_EQ(Named(words, nullptr, by_places), below(all, name)) << name;
      EXPECT_EQ(Named(words, &kUser, by_places), below(readable, name)) << name;
      EXPECT_FALSE(below(readable, name).empty());
    }
  }
  EXPECT_EQ(Named({"tax"}, nullptr, true), "") << "far more than a quarter";
}

TEST_F(FolderWordsTest, TheRootOfAllAndWhatIsAboveItDoNotCount) {
  Put("/v/tax", true, "0755");
  Put("/v/tax/letter", false, "0644");
  store_.Commit();
  for (const Asker* asker : {static_cast<const Asker*>(nullptr), &kUser}) {
    EXPECT_EQ(Named({"tax"}, asker, false) + Named({"v"}, asker, true), "");
  }
  Put("/v/tax/tax", true, "0755");
  Put("/v/tax/tax/bill", false, "0644");
  store_.Commit();
  for (const Asker* asker : {static_cast<const Asker*>(nullptr), &kUser}) {
    EXPECT_EQ(Named({"ta"}, asker, false, true) + Named({"ta"}, asker, true, true),
              "/v/tax/tax/bill\n/v/tax/tax/bill\n");
  }
}

}  // namespace
}  // namespace ferrox::engine
