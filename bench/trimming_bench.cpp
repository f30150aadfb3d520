// What it costs that users find only what they may read, on a large index: 1,000,000 small documents in 100,000 folders
// five levels deep unless told otherwise, with 40 different records, of which every second folder of the lowest level
// is closed to the users who ask. Measured is one query, of the rarest word, as somebody who may read everything and as
// users: the first of all, the first of each user, those after it, and those after a commit that changes the rights of
// a folder, or add a document: processor time of the searching thread.
// At the end the same for a user who is not shown the names of one in ten documents and folders, and how long it takes
// until all names are compared with such patterns.
//   trimming_bench [--documents N] [--folder DIR]      DIR: the index is kept there, and used again by the next run
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <json/value.h>

#include "base/name_rules.h"
#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/store/sqlite_store.h"

namespace {

using ferrox::engine::Asker;
using ferrox::engine::SearchRequest;
using ferrox::engine::SqliteStore;

constexpr char kTop[] = "/volume1/tree";
constexpr size_t kRounds = 41;

/// The processor time of this thread, which hardly depends on what else the machine does.
double ThreadMs() {
  timespec now = {};
  (void)clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) * 1e3 + static_cast<double>(now.tv_nsec) / 1e6;
}

std::vector<std::string> Folders(size_t count) {
  std::vector<std::string> folders = {kTop};
  for (size_t above = 0; folders.size() < count; ++above) {
    const size_t children = above == 0 ? 9 : above < 10 ? 100 : 10;
    for (size_t i = 0; i < children && folders.size() < count; ++i) {
      folders.push_back(folders[above] + "/f" + std::to_string(i));
    }
  }
  return folders;
}

Json::Value Document(const std::string& path, bool is_folder, size_t number) {
  Json::Value document;
  const std::string name = path.substr(path.rfind('/') + 1);
  document["KOVAMDPath"] = path;
  for (const char* field : {"KOVAMDFSName", "KOVAMDSearchFileName", "KOVAMDDisplayName"}) document[field] = name;
  document["KOVAMDIsDir"] = is_folder;
  document["KOVAMDFSSize"] = Json::Int64(number * 31 % 100000);
  document["KOVAMDFSContentChangeDate"] = Json::Int64(1500000000 + number * 7919 % 200000000);
  const bool is_closed = is_folder && number >= 10000 && number % 2 == 0;
  document["_KOVAAccess"] =
      (is_folder ? "0:0:" : std::to_string(number % 40) + ":0:") + std::string(is_closed   ? "0700"
                                                                               : is_folder ? "0755"
                                                                                           : "0644");
  if (!is_folder) {
    document["KOVAMDTextContent"] =
        "common word" + std::to_string(number % 20000) + (number % 10000 == 0 ? " rare" : "");
  }
  return document;
}

void Build(SqliteStore& store, size_t documents) {
  const std::vector<std::string> folders = Folders(documents / 10);
  size_t number = 0;
  for (size_t i = 0; i < folders.size(); ++i) {
    store.Upsert(folders[i], Document(folders[i], true, i));
    for (size_t n = 0; n < 9; ++n, ++number) {
      const std::string path = folders[i] + "/report_" + std::to_string(number) + ".txt";
      store.Upsert(path, Document(path, false, number));
    }
    if (i % 5000 == 0) store.Commit();
  }
  store.Commit();
}

class Bench {
 public:
  Bench(const std::string& file, size_t documents) : file_(file), documents_(documents) {
    const bool is_there = std::filesystem::exists(file_);
    Open();
    if (!is_there) Build(*store_, documents_);
  }

  void Run() {
    printf("%zu documents; p50 (worst) in ms of processor time\n", documents_);
    Measure(
        "of all, index just opened", [this](size_t) { Open(); }, nullptr);
    Measure(
        "a user's, just opened", [this](size_t) { Open(); }, &user_);
    Measure(
        "of all", [](size_t) {}, nullptr);
    Measure(
        "a user's first", [this](size_t round) { user_ = User(1 + round); }, &user_);
    Measure(
        "a user's later ones", [](size_t) {}, &user_);
    Measure(
        "after a new document", [this](size_t round) { Change(round, false); }, &user_);
    Measure(
        "  the same, of all", [this](size_t round) { Change(kRounds + round, false); }, nullptr);
    Measure(
        "after a folder's rights", [this](size_t round) { Change(round, true); }, &user_);
    Measure(
        "  the same, of all", [this](size_t round) { Change(kRounds + round, true); }, nullptr);
    MeasureNames();
  }

 private:
  static Asker User(size_t number) {
    const auto uid = static_cast<uint32_t>(50001 + number);
    return {uid, {uid, 60000}, kTop, ""};
  }

  void Open() {
    store_.reset();
    store_ = std::make_unique<SqliteStore>(file_, true, std::make_shared<ferrox::engine::Schema>(Json::Value()));
  }

  double Ask(const Asker* asker) {
    const ferrox::engine::QueryNode query = ferrox::engine::ParseQuery("rare", 1718000000);
    SearchRequest request;
    request.query = &query;
    request.asker = asker;
    const double began = ThreadMs();
    found_ = store_->Search(request).total;
    return ThreadMs() - began;
  }

  void Measure(const char* name, const std::function<void(size_t)>& before, const Asker* asker) {
    std::vector<double> times;
    for (size_t round = 0; round < kRounds; ++round) {
      before(round);
      times.push_back(Ask(asker));
    }
    std::sort(times.begin(), times.end());
    printf("%-26s %6.2f (%.2f), %d found\n", name, times[kRounds / 2], times.back(), static_cast<int>(found_));
  }

  void MeasureNames() {
    rules_ = base::NameRules::TextOf({"*3.txt", "f3", "~*", ".DS_Store", "*.part"}, false);
    const double began = ThreadMs();
    while (!store_->Obeys(rules_)) store_->ObeySome(rules_);
    printf("all names compared in      %6.0f ms\n", ThreadMs() - began);
    user_ = User(0);
    user_.unseen_names = rules_;
    Measure(
        "names, just opened", [this](size_t) { Open(); }, &user_);
    Measure(
        "names, a user's first",
        [this](size_t round) {
          user_ = User(1 + round);
          user_.unseen_names = rules_;
        },
        &user_);
    Measure(
        "names, later ones", [](size_t) {}, &user_);
    Measure(
        "names, after a document", [this](size_t round) { Change(2 * kRounds + round, false); }, &user_);
    Measure(
        "names, after rights", [this](size_t round) { Change(2 * kRounds + round, true); }, &user_);
    while (!store_->Obeys("")) store_->ObeySome("");
  }

  void Change(size_t round, bool rights) {
    const std::string folder = std::string(kTop) + "/f1";
    if (rights) {
      (void)store_->SetAccess({{folder, "1.1.1.1", round % 2 == 0 ? "0:0:0700" : "0:0:0755"}});
    } else {
      const std::string path = folder + "/new" + std::to_string(round);
      store_->Upsert(path, Document(path, false, round + 1));
    }
    store_->Commit();
  }

  const std::string file_;
  const size_t documents_;
  std::unique_ptr<SqliteStore> store_;
  Asker user_ = User(0);
  std::string rules_;
  int64_t found_ = 0;
};

}  // namespace

int main(int argc, char** argv) {
  size_t documents = 1000000;
  std::string folder;
  for (int i = 1; i + 1 < argc; i += 2) {
    if (strcmp(argv[i], "--documents") == 0) documents = strtoul(argv[i + 1], nullptr, 10);
    if (strcmp(argv[i], "--folder") == 0) folder = argv[i + 1];
  }
  std::string made = std::filesystem::temp_directory_path().string() + "/trimming-XXXXXX";
  if (folder.empty() && mkdtemp(made.data()) == nullptr) return 1;
  Bench((folder.empty() ? made : folder) + "/index.sqlite", documents).Run();
  if (folder.empty()) std::filesystem::remove_all(made);
  return 0;
}
