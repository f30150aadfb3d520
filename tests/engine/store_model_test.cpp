// Catches documents that get lost in the tree of folders, stand in another order than that of their paths' bytes, or
// have another's access record, which folders have, too: random changes beside a model that knows whole paths only.
#include <map>
#include <random>

#include <gtest/gtest.h>

#include "base/path.h"
#include "services/kovaelasticd/search/path_condition.h"
#include "services/kovaelasticd/store/access_records.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/length_class.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"
#include "wire/folder_digest.h"

namespace ferrox::engine {
namespace {

Json::Value Moved(const std::string& path) {
  Json::Value change;
  change["KOVAMDPath"] = path;
  return change;
}

class StoreModel {
 public:
  /// Without mappings the date of a change of rights is searched for, with those of file indices it is not.
  explicit StoreModel(uint32_t seed) : random_(seed) {
    // On so short pages lists of documents, and of places within one, go over several.
    if (seed % 2 == 0) {
      SqliteStore store(folder_ / "index.sqlite", true, PlainSchema());
      Database database(folder_ / "index.sqlite", Database::Mode::kWrite);
      RegisterFullText(database);
      for (const char* table : {"content_fts", "meta_fts"}) {
        database.Execute("INSERT INTO " + std::string(table) + "(" + table + ", rank) VALUES('pgsz', 64)");
      }
    }

    if (seed % 2 == 0) mappings_["properties"]["KOVAMDAttributeChangeDate"]["type"] = "int";
    Reopen();
  }

  void Step() {
    switch (random_() % 14) {
      case 0:
        return Move(Path(), Path());
      case 1:
        return DeletePrefix();
      case 2:
        return Delete(Path());
      case 3:
        store_->Commit();
        committed_ = files_;
        committed_folders_ = folders_;
        return Reopen();
      case 4:
        store_->Rollback();
        files_ = committed_;
        folders_ = committed_folders_;
        return;
      case 5:
        return SetAccess();
      case 6:
        store_->Commit();
        committed_ = files_;
        committed_folders_ = folders_;
        for (auto turns = random_() % 4; turns > 0; --turns) store_->ClearSome();
        return;
      default:
        return Put(Path());
    }
  }

  void Check() {
    const std::string prefix = Prefix();
    const std::string after = random_() % 2 == 0 ? "" : Prefix();
    const int64_t limit = random_() % 3 == 0 ? 2 : -1;
    std::string expected, listed;
    int64_t left = limit;
    for (auto it = files_.lower_bound(prefix); it != files_.end() && it->first.starts_with(prefix); ++it) {
      if (it->first <= after || left == 0) continue;
      expected += it->first + " " + it->second.Text() + "\n";
      --left;
    }
    const std::vector<std::string> fields = {"KOVAMDPath", "_KOVAAccess", "_KOVAStamp", "KOVAMDOwnerUserID",
                                             "KOVAMDAttributeChangeDate"};
    store_->Get({"", prefix, after, limit, fields}, [&](const Json::Value& entry) {
      for (const std::string& field : fields) listed += entry[field].asString() + (field == fields.back() ? "\n" : " ");
    });
    ASSERT_EQ(expected, listed) << "prefix " << prefix << " after " << after << " limit " << limit;
  }

  /// A page of the unread documents, most times the one behind that of the last call.
  void CheckUnread() {
    if (random_() % 20 == 0) unread_after_ = Prefix();
    std::vector<std::string> expected, listed;
    for (auto it = files_.upper_bound(unread_after_); it != files_.end() && expected.size() < 2; ++it) {
      if (it->second.is_unread) expected.push_back(it->first);
    }
    GetRequest request{"", "", unread_after_, 2, {"KOVAMDPath"}};
    request.unread = true;
    store_->Get(request, [&](const Json::Value& entry) { listed.push_back(entry["KOVAMDPath"].asString()); });
    ASSERT_EQ(expected, listed) << "behind " << unread_after_;
    unread_after_ = listed.size() < 2 ? "" : listed.back();
  }

  /// The digests of the folders below some folder, in short pages, and each time the documents in one of these.
  void CheckDigests() {
    DigestRequest request = {Path() + "/", "", random_(), int64_t(1 + random_() % 3), 2, int64_t(1 + random_() % 9)};
    std::map<std::string, wire::FolderDigest> expected;
    std::map<std::string, std::vector<std::string>> documents;
    for (const auto& [path, file] : files_) {
      const std::string folder = path.substr(0, path.rfind('/') + 1);
      if (!folder.starts_with(request.path)) continue;
      const unsigned marks =
          (file.access.empty() ? wire::FolderDigest::kNoAccess : 0U) |
          (file.is_unread ? wire::FolderDigest::kWithContent : wire::FolderDigest::kCutWithoutReason);
      wire::FolderDigest& digest = expected.try_emplace(folder, request.seed).first->second;
      digest.Add(path.substr(folder.size()), file.Stamp(), marks);
      documents[folder].push_back(path);
    }
    auto at = expected.begin();
    for (bool more = true; more;) {
      const DigestPage page = store_->Digests(request);
      for (const FolderState& folder : page.folders) {
        ASSERT_NE(at, expected.end()) << folder.path;
        ASSERT_EQ(at->first, folder.path);
        const bool few = at->second.Count() <= 2;
        ASSERT_EQ(few ? std::optional(at->second.Value()) : std::nullopt, folder.digest) << folder.path;
        const std::vector<std::string>& in = documents[at->first];
        const auto is_unread = [this](const std::string& path) { return files_[path].is_unread; };
        ASSERT_TRUE(!few || std::any_of(in.begin(), in.end(), is_unread) == (folder.unread.size() == 1)) << folder.path;
        ++at;
      }
      more = page.more;
      if (more) request.after = page.folders.back().path;
    }
    ASSERT_EQ(at, expected.end()) << at->first;
    for (auto& [folder, in] : documents) {
      GetRequest get = {"", "", random_() % 2 == 0 ? "" : in.front(), -1, {"KOVAMDPath"}};
      get.folder = folder;
      std::vector<std::string> listed;
      if (!get.after.empty()) listed.push_back(in.front());
      store_->Get(get, [&](const Json::Value& entry) { listed.push_back(entry["KOVAMDPath"].asString()); });
      ASSERT_EQ(in, listed);
    }
  }

  /// What searches see, which is what was committed.
  void CheckSearch() {
    const std::string folder = Path();
    if (folder.find("//") != folder.npos || folder.back() == '/') return;  // nobody asks for such
    int64_t expected = 0;
    for (const auto& [path, file] : committed_) expected += base::IsAtOrBelow(path, folder) ? 1 : 0;
    ASSERT_EQ(expected, Find(*store_, "path:\"" + folder + "\"").total) << folder;
    ASSERT_EQ(std::ssize(committed_), store_->Stat().documents);
    for (const char* query : {"word", "-other", "kind:other word OR size:>1"}) {
      const SearchReply reply = Find(*store_, query, {nullptr, 0, 1000});
      ASSERT_EQ(std::ssize(committed_), reply.total) << query;
      for (const SearchHit& hit : reply.hits) ASSERT_TRUE(committed_.contains(hit.path)) << hit.path;
    }
    const auto lacks = [](const auto& entry) { return entry.second.access.empty(); };
    ASSERT_EQ(std::count_if(committed_.begin(), committed_.end(), lacks), store_->Stat().without_access);
    const auto owned = [](const auto& entry) { return entry.second.owner == "1000"; };
    ASSERT_EQ(std::count_if(committed_.begin(), committed_.end(), owned), Find(*store_, "owner:1000").total);
  }

  /// Each committed folder has the record of its own document, else what it was given.
  void CheckFolders() {
    Database database(folder_ / "index.sqlite", Database::Mode::kRead);
    FolderTree tree(database);
    std::map<int64_t, std::string> records = {{0, ""}};
    ReadAccessRecords(database, 1, 1000, [&](int64_t number, const base::AccessRecord& record) {
      records[number] = base::AccessText(record);
    });
    for (const auto& [path, file] : committed_) {
      for (size_t end = path.rfind('/'); end > 0; end = path.rfind('/', end - 1)) {
        const auto own = committed_.find(path.substr(0, end));
        const auto given = committed_folders_.find(path.substr(0, end + 1));
        const bool has = own != committed_.end() && own->second.is_folder;
        const int64_t folder = tree.Find(path.substr(0, end + 1));
        ASSERT_EQ(has                                 ? own->second.access
                  : given != committed_folders_.end() ? given->second
                                                      : "",
                  records[tree.AccessOf(folder)])
            << path.substr(0, end + 1);
      }
    }
  }

  /// The same by the places in memory, which follow each commit; and that they are those of the rows.
  void CheckPlaces() {
    std::unique_ptr<StoreReader> reader = readers_.Borrow();
    reader->database.Execute("BEGIN");
    reader->Refresh();
    const int64_t version = LoadTotals(reader->database).version;
    const std::shared_ptr<const Places> places = reader->places.Load(reader->database, version);
    std::string folder = Path();
    if (folder.find("//") != folder.npos || folder.back() == '/') folder = "/a";
    DocSet all, found;
    Statement rows = reader->database.Prepare("SELECT id, folder, access, text_bytes, leaf FROM docs");
    while (rows.Step()) {
      const auto number = static_cast<size_t>(rows.Int(0));
      const Place place = places->Documents().At(number);
      ASSERT_TRUE(place.folder == rows.Int(1) && place.access == rows.Int(2)) << number;
      ASSERT_TRUE((place.length != 0) == (rows.Int(3) != 0)) << number;
      ASSERT_LE(std::abs(LengthOfClass(static_cast<uint8_t>(place.length)) - rows.Int(3)), rows.Int(3) / 16) << number;
      ASSERT_EQ(NameHash(rows.Text(4)), places->Documents().NameAt(number)) << number;
      all.Add(rows.Int(0));
    }
    if (reader->hidden != nullptr) all.Subtract(*reader->hidden);
    int64_t expected = 0;
    for (const auto& [path, file] : committed_) expected += base::IsAtOrBelow(path, folder) ? 1 : 0;
    PathCondition condition(*reader, version, folder);
    found = all;
    condition.Apply(found, true);
    ASSERT_EQ(expected, found.Count()) << folder;
    ASSERT_EQ(expected, condition.AllDocuments().Count()) << folder;
    condition.Apply(all, false);
    ASSERT_EQ(std::ssize(committed_), found.Count() + all.Count());
    reader->database.Execute("COMMIT");
    if (random_() % 5 == 0) {
      const auto later = std::chrono::steady_clock::now() + PlacesCache::kIdle;
      reader->places.GiveBack(later);
      store_->GiveBack(later);
      ASSERT_FALSE(store_->NextGiveBack().has_value());
    }
    readers_.Return(std::move(reader));
  }

  /// What is left in the file once all is cleared, beside that of an index of the same documents.
  void CheckWords() {
    store_->Commit();
    while (store_->Uncleared() > 0) store_->ClearSome();
    SqliteStore fresh(folder_ / "fresh.sqlite", true, std::make_shared<Schema>(mappings_));
    store_->Get({"", "/", "", -1, {}}, [&](Json::Value entry) {
      const std::string path = entry["KOVAMDPath"].asString();
      store_->Get({path, "", "", -1, {"KOVAMDTextContent"}},
                  [&](const Json::Value& text) { entry["KOVAMDTextContent"] = text["KOVAMDTextContent"]; });
      fresh.Upsert(path, entry);
    });
    fresh.Commit();
    store_.reset();
    Database database(folder_ / "index.sqlite", Database::Mode::kWrite);
    RegisterFullText(database);
    for (const char* table : {"content_fts", "meta_fts"}) {
      database.Execute("INSERT INTO " + std::string(table) + "(" + table + ") VALUES('integrity-check')");
    }
    EXPECT_EQ(ContentOf(folder_ / "fresh.sqlite"), ContentOf(folder_ / "index.sqlite"));
  }

 private:
  struct File {
    std::string access;
    bool is_folder;
    bool is_unread;
    std::string content;
    int64_t changed;
    std::string owner = {};
    bool has_date = false;

    std::string Stamp() const { return content + "." + std::to_string(changed) + "000000000.0"; }
    std::string Text() const {
      return access + " " + Stamp() + " " + owner + " " + (has_date ? std::to_string(changed) : "");
    }
  };

  void Reopen() {
    store_.reset();
    auto store = std::make_unique<SqliteStore>(folder_ / "index.sqlite", true, std::make_shared<Schema>(mappings_));
    store->LimitClearing({2, 3, 1 << 20, 1, random_() % 2 == 0 ? 1 : 1000});
    store_ = std::move(store);
  }
  /// The words, each with the number of documents that have it, and how many rows the tables have.
  static std::string ContentOf(const std::string& path) {
    Database database(path, Database::Mode::kRead);
    RegisterFullText(database);
    std::string content;
    for (const std::string table : {"content", "meta"}) {
      database.Execute("CREATE VIRTUAL TABLE temp." + table + " USING fts5vocab('main', '" + table + "_fts', 'row')");
      Statement words = database.Prepare("SELECT term || ' ' || doc FROM temp." + table);
      while (words.Step()) content += std::string(words.Text(0)) + "\n";
    }
    for (const std::string table : {"docs", "folders", "bodies", "files", "suspects"}) {
      content += table + " " + std::to_string(database.QueryInt(("SELECT count(*) FROM " + table).c_str())) + "\n";
    }
    return content;
  }
  std::string Path() {
    static const char* const kNames[] = {"a", "a-b", "a0", "b", "\xFF", "\xC3\xA9", "", "A"};
    std::string path;
    for (size_t depth = 1 + random_() % 4; depth > 0; --depth) path += "/" + std::string(kNames[random_() % 8]);
    return path;
  }
  std::string Prefix() {
    const std::string path = Path();
    return path.substr(0, 1 + random_() % path.size());
  }
  std::string Access() {
    static const char* const kAccess[] = {"", "0:0:0755", "1000:100:2640", "0:0:0604:u5001=4,u7=0,g=7,g200=6"};
    return kAccess[random_() % 4];
  }
  void Put(const std::string& path) {
    Json::Value document = FileDocument(path, Text());
    const File file = {Access(), random_() % 2 == 0, random_() % 3 == 0, Content(), int64_t(random_() % 3)};
    document["_KOVAStamp"] = file.Stamp();
    if (file.is_unread) document["_KOVAExtractError"] = "not text";
    document["_KOVANeedMeta"] = file.is_unread;
    document["_KOVATextCut"] = true;
    document["KOVAMDIsDir"] = file.is_folder;
    if (!file.access.empty()) document["_KOVAAccess"] = file.access;
    store_->Upsert(path, document);
    files_[path] = file;
    ForgetFolders();
  }
  std::string Text() {
    std::string text = "word";
    for (auto words = random_() % 5; words > 0; --words) {
      const std::string word = " w" + std::to_string(random_() % 30);
      for (auto count = random_() % 25; count > 0; --count) text += word;
    }
    return text;
  }
  std::string Content() { return random_() % 4 == 0 ? "2.1" : "1.1"; }
  void SetAccess() {
    std::vector<AccessChange> changes;
    AccessReport expected;
    for (size_t i = 0; i < 5; ++i) {
      const File seen = {"0:0:0755", false, false, Content(), int64_t(random_() % 3)};
      changes.push_back({Path(), seen.Stamp(), random_() % 2 == 0 ? "0:0:0755" : "1000:100:0600"});
      const auto [path, stamp, access] = changes.back();
      const auto found = files_.find(path);
      if (found == files_.end()) {
        expected.missing.push_back(i);
        folders_[path + "/"] = access;
        ForgetFolders();
        continue;
      }
      File& file = found->second;
      file.access = access;
      if (file.content != seen.content) {
        expected.differing.push_back(i);
        continue;
      }
      file.changed = seen.changed;
      file.owner = access.substr(0, access.find(':'));
      file.has_date = true;
    }
    const AccessReport report = store_->SetAccess(changes);
    EXPECT_EQ(expected.missing, report.missing);
    EXPECT_EQ(expected.differing, report.differing);
  }
  /// A folder's own record is that of its document if there is one, and goes with the last document below it.
  void ForgetFolders() {
    std::erase_if(folders_, [this](const auto& folder) {
      const auto below = files_.lower_bound(folder.first);
      const auto own = files_.find(folder.first.substr(0, folder.first.size() - 1));
      return below == files_.end() || !below->first.starts_with(folder.first) ||
             (own != files_.end() && own->second.is_folder);
    });
  }
  void Delete(const std::string& path) {
    store_->Delete(path);
    files_.erase(path);
    ForgetFolders();
  }
  void DeletePrefix() {
    const std::string prefix = Prefix();
    if (prefix == "/") return;  // too seldom would anything be left
    store_->DeletePrefix(prefix);
    std::erase_if(files_, [&](const auto& file) { return file.first.starts_with(prefix); });
    ForgetFolders();
  }
  /// As the library moves a folder: its own document, then one by one each that was below; or all at once.
  void Move(const std::string& from, const std::string& to) {
    if (base::IsAtOrBelow(to, from) || base::IsAtOrBelow(from, to)) return;
    std::map<std::string, std::string> moves;
    for (const auto& [path, file] : files_) {
      if (path == from || path.starts_with(from + "/")) moves[path] = to + path.substr(from.size());
    }
    const bool at_once = files_.contains(from) && random_() % 2 == 0;
    const auto there = files_.lower_bound(to + "/");
    const bool is_new = there == files_.end() || !there->first.starts_with(to + "/");
    std::map<std::string, std::string> folders;
    if (at_once) {
      store_->MoveFolder(from, "", Moved(to));
      for (const auto& [path, access] : folders_) {
        if (is_new && path.starts_with(from + "/")) folders[to + path.substr(from.size())] = access;
      }
    }
    for (const auto& [old_path, new_path] : moves) {
      if (!at_once) store_->Set(old_path, Moved(new_path));
      if (files_.erase(new_path) != 0) ForgetFolders();
      files_.insert_or_assign(new_path, files_.extract(old_path).mapped());
      if (folders.empty()) ForgetFolders();
    }
    folders_.merge(folders);
    ForgetFolders();
  }

  std::mt19937 random_;
  test::TempDir folder_;
  Json::Value mappings_;
  std::unique_ptr<IndexStore> store_;
  ReaderPool readers_{folder_ / "index.sqlite"};
  std::map<std::string, File> files_;
  std::map<std::string, File> committed_;
  std::map<std::string, std::string> folders_;  ///< records that folders were given, by path with "/"
  std::map<std::string, std::string> committed_folders_;
  std::string unread_after_;
};

TEST(StoreModelTest, AnySequenceOfChangesLeavesTheDocumentsOfTheModel) {
  for (uint32_t seed = 1; seed <= 6; ++seed) {
    SCOPED_TRACE(seed);
    StoreModel model(seed);
    for (int i = 0; i < 400; ++i) {
      model.Step();
      ASSERT_NO_FATAL_FAILURE(model.Check()) << "step " << i;
      ASSERT_NO_FATAL_FAILURE(model.CheckUnread()) << "step " << i;
      ASSERT_NO_FATAL_FAILURE(model.CheckDigests()) << "step " << i;
      if (i % 10 != 0) continue;
      ASSERT_NO_FATAL_FAILURE(model.CheckSearch()) << "step " << i;
      ASSERT_NO_FATAL_FAILURE(model.CheckFolders()) << "step " << i;
      ASSERT_NO_FATAL_FAILURE(model.CheckPlaces()) << "step " << i;
    }
    model.CheckWords();
  }
}

}  // namespace
}  // namespace ferrox::engine
