// What the search engine costs: generated text (words drawn by Zipf's law from 60,000, seed fixed) in 20,000 documents
// of 0.5 to 60 KB unless told otherwise, sent as requests to the engine inside this process, without a socket. Measured
// are building, the size of the index, one change with its commit, 50 ranked queries, 20 hits with snippets each, the
// same and two sorted ones beside those of a user who may read every second document, a change of the rights of many
// files, the rename of a folder with a quarter of the documents, and its deletion, beside that of as many documents one
// by one.
//   engine_bench [--documents N] [--text BYTES] [--folder DIR]      BYTES: the size of each text
#include <sys/resource.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <functional>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include <json/value.h>

#include "common/json_util.h"
#include "services/kovaelasticd/commands/engine.h"
#include "services/kovaelasticd/search/sqlite_search.h"
#include "wire/engine_requests.h"

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr size_t kVocabulary = 60000;
constexpr char kId[] = "fileindex_bench";
constexpr size_t kRounds = 10;

double WallSec(SteadyClock::time_point since) {
  return std::chrono::duration<double>(SteadyClock::now() - since).count();
}

double CpuSec() {
  rusage usage = {};
  (void)getrusage(RUSAGE_SELF, &usage);
  const auto seconds = [](const timeval& t) {
    return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_usec) / 1e6;
  };
  return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

/// The processor time of this thread, which hardly depends on what else the machine does.
double ThreadMs() {
  timespec now = {};
  (void)clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) * 1e3 + static_cast<double>(now.tv_nsec) / 1e6;
}

long PeakMemoryMb() {
  rusage usage = {};
  (void)getrusage(RUSAGE_SELF, &usage);
  return usage.ru_maxrss / 1024;
}

/// Words by Zipf's law: the n-th most frequent is drawn with a weight of about 1 / n.
class TextSource {
 public:
  TextSource() {
    constexpr const char* kSyllables[] = {"ba", "ce", "di", "fo", "gu",  "la",  "me",  "ni",  "po",  "ru",
                                          "sa", "te", "vi", "zo", "tra", "spe", "kli", "mon", "ter", "han"};
    double sum = 0;
    for (size_t rank = 0; rank < kVocabulary; ++rank) {
      std::string word;
      for (size_t rest = rank + 20; rest > 0; rest /= 20) word += kSyllables[rest % 20];
      words_.push_back(word);
      sum += 1 / std::pow(static_cast<double>(rank + 1), 1.05);
      sums_.push_back(sum);
    }
  }
  const std::string& Word(size_t rank) const { return words_[rank]; }
  const std::string& Draw(std::mt19937_64& random) const {
    const double at = std::uniform_real_distribution<double>(0, sums_.back())(random);
    return words_[static_cast<size_t>(std::lower_bound(sums_.begin(), sums_.end(), at) - sums_.begin())];
  }
  std::string Text(std::mt19937_64& random, size_t bytes) const {
    std::string text;
    while (text.size() < bytes) {
      text += Draw(random);
      text += random() % 12 == 0 ? ".\n" : " ";
    }
    return text;
  }

 private:
  std::vector<std::string> words_;
  std::vector<double> sums_;
};

class Bench {
 public:
  /// `text_bytes`, unless 0, is the size of each text.
  Bench(const std::string& folder, size_t documents, size_t text_bytes)
      : folder_(folder), documents_(documents), text_bytes_(text_bytes), engine_(folder) {}

  void Run() {
    Call("index_create", [this](Json::Value& data) {
      data["path"] = folder_ + "/index";
      data["mappings"]["properties"]["KOVAMDAttributeChangeDate"]["type"] = "int";  // as in file indices
    });
    Build();
    MeasureUpsert();
    MeasureQueries();
    MeasureAsker();
    MeasureAccess();
    MeasureRename();
    MeasureDelete();
    printf("peak memory            %ld MB\n", PeakMemoryMb());
  }

 private:
  Json::Value Send(const Json::Value& request) {
    Json::Value reply;
    (void)ferrox::fromString(reply, engine_.Handle(ferrox::toString(request), {}));
    if (!reply["success"].asBool()) {
      (void)fprintf(stderr, "engine_bench: %s\n", ferrox::toString(reply).c_str());
      exit(1);
    }
    return reply["data"];
  }

  Json::Value Call(const char* command, const std::function<void(Json::Value&)>& fill = {}) {
    Json::Value request;
    request["command"] = command;
    request["data"]["id"] = kId;
    if (fill) fill(request["data"]);
    return Send(request);
  }

  std::string PathOf(size_t number) const {
    return "/volume1/bench/folder" + std::to_string(number / 200) + "/" + source_.Word(number % kVocabulary) + "_" +
           std::to_string(number) + (number % 3 == 0 ? ".txt" : ".html");
  }

  /// As of a file whose rights have changed so many times.
  static std::string StampOf(size_t number, size_t changes) {
    const int64_t changed = 1500000000123456789 + static_cast<int64_t>(changes) * 1000000000;
    return "4096.1500000000123456789." + std::to_string(changed) + "." + std::to_string(number + 1);
  }

  void Upsert(size_t number, const std::string& text) {
    const std::string path = PathOf(number);
    Call("document_upsert_by_id", [&](Json::Value& data) {
      data["doc_id"] = path;
      Json::Value& document = data["data"];
      document["KOVAMDPath"] = path;
      document["KOVAMDParent"] = path.substr(0, path.rfind('/'));
      for (const char* name : {"KOVAMDFSName", "KOVAMDSearchFileName", "KOVAMDDisplayName"}) {
        document[name] = path.substr(path.rfind('/') + 1);
      }
      document["KOVAMDExtension"] = document["KOVAMDKind"] = path.substr(path.rfind('.') + 1);
      document["KOVAMDIsDir"] = false;
      document["KOVAMDFSSize"] = Json::Int64(text.size());
      document["KOVAMDFSContentChangeDate"] = Json::Int64(1500000000 + number * 7919 % 200000000);
      document["KOVAMDOwnerUserID"] = "1000";
      document["KOVAMDOwnerGroupID"] = "100";
      document["KOVAMDAttributeChangeDate"] = 1500000000;
      document["_KOVAStamp"] = StampOf(number, 0);
      document["_KOVAAccess"] = number % 2 == 0 ? "1000:100:0644" : "1000:100:0640";
      document["KOVAMDTextContent"] = text;
    });
  }

  void Build() {
    const double cpu = CpuSec();
    const auto began = SteadyClock::now();
    double text_bytes = 0;
    double generating = 0;
    for (size_t number = 0; number < documents_; ++number) {
      const double before = CpuSec();
      const double drawn = 512 * std::exp(std::uniform_real_distribution<double>(0, 4.77)(random_));
      const double size = text_bytes_ > 0 ? static_cast<double>(text_bytes_) : drawn;
      const std::string text = source_.Text(random_, static_cast<size_t>(size));
      if (number % 1000 == 0) samples_.push_back(text);
      text_bytes += static_cast<double>(text.size());
      generating += CpuSec() - before;
      Upsert(number, text);
    }
    Call("commit");
    const double wall = WallSec(began) - generating;
    const double spent = CpuSec() - cpu - generating;
    const Json::Value stat = Call("index_stat");
    printf("documents              %zu, %.0f MB of text\n", documents_, text_bytes / 1e6);
    printf("build                  %.1f s, %.1f s of CPU, %.1f MB of text a CPU second\n", wall, spent,
           text_bytes / 1e6 / spent);
    printf("index / text           %.2f\n", stat["bytes_on_disk"].asDouble() / text_bytes);
  }

  void MeasureUpsert() {
    constexpr size_t kChanges = 50;
    const double cpu = CpuSec();
    const auto began = SteadyClock::now();
    for (size_t i = 0; i < kChanges; ++i) {
      Upsert(i * 131 % documents_, source_.Text(random_, 8000));
      Call("commit");
    }
    printf("change 1 + commit      %.2f ms, %.2f ms of CPU\n", WallSec(began) * 1000 / kChanges,
           (CpuSec() - cpu) * 1000 / kChanges);
  }

  std::vector<std::string> Queries() {
    std::vector<std::string> queries;
    for (size_t i = 0; i < 10; ++i) queries.push_back(source_.Word(i * i));            // frequent
    for (size_t i = 0; i < 10; ++i) queries.push_back(source_.Word(2000 + 5000 * i));  // rare
    for (size_t i = 0; i < 8; ++i) queries.push_back(source_.Word(i) + " " + source_.Word(10 + 40 * i));
    for (size_t i = 0; i < 8; ++i) {  // phrases that are there
      const std::string& text = samples_[i % samples_.size()];
      const size_t begin = text.find(' ', text.size() / 3) + 1;
      queries.push_back("\"" + text.substr(begin, text.find(' ', text.find(' ', begin) + 1) - begin) + "\"");
      std::replace(queries.back().begin(), queries.back().end(), '\n', ' ');
    }
    for (size_t i = 0; i < 6; ++i) queries.push_back(source_.Word(400 + 60 * i).substr(0, 5) + "*");
    for (size_t i = 0; i < 4; ++i) queries.push_back(source_.Word(i) + " ext:txt date:2018 size:>4k");
    for (size_t i = 0; i < 4; ++i) queries.push_back(source_.Word(5 * i) + " OR " + source_.Word(300 + i));
    return queries;
  }

  void MeasureQueries() {
    std::vector<std::pair<double, std::string>> times;
    for (const std::string& query : Queries()) {
      const auto began = SteadyClock::now();
      const Json::Value found = Call("search", [&query](Json::Value& data) { data["query"] = query; });
      times.emplace_back(WallSec(began) * 1000, query + " (" + found["total"].asString() + " hits)");
    }
    std::sort(times.begin(), times.end());
    printf("ranked query           p50 %.2f ms, p99 %.2f ms (%s)\n", times[times.size() / 2].first, times.back().first,
           times.back().second.c_str());
    if (getenv("ENGINE_BENCH_QUERIES") != nullptr) {
      for (const auto& [ms, query] : times) printf("  %8.2f ms  %s\n", ms, query.c_str());
    }
  }

  /// The same queries, and two that are sorted by columns, as somebody who may read everything and as a user who may
  /// read half; in turn, on the index file itself.
  void MeasureAsker() {
    std::vector<ferrox::wire::SeenAccess> folders = {{"/volume1/bench", "1.1.1.1", "0:0:0755"}};
    for (size_t number = 0; number < documents_; number += 200) {
      folders.push_back({"/volume1/bench/folder" + std::to_string(number / 200), "1.1.1.1", "0:0:0755"});
    }
    (void)engine_.Handle(ferrox::toString(ferrox::wire::AccessSetRequest(kId, folders)), {});
    Call("commit");
    const ferrox::engine::Asker asker = {50001, {50001}, "/volume1/bench"};
    ferrox::engine::ReaderPool readers(folder_ + "/index/index.sqlite");
    std::vector<double> times[2];
    int64_t totals[2] = {};
    std::vector<std::string> queries = Queries();
    queries.insert(queries.end(), 2, source_.Word(1));
    for (size_t round = 0; round <= kRounds; ++round) {
      for (size_t i = 0; i < queries.size(); ++i) {
        const ferrox::engine::QueryNode query = ferrox::engine::ParseQuery(queries[i], 1718000000);
        for (const size_t who : {size_t{0}, size_t{1}}) {
          ferrox::engine::SearchRequest request;
          request.query = &query;
          request.asker = who == 0 ? nullptr : &asker;
          if (i + 2 == queries.size()) request.sort = ferrox::engine::SortKey::kDate;
          if (i + 1 == queries.size()) request.sort = ferrox::engine::SortKey::kName;
          const double began = ThreadMs();
          totals[who] += ferrox::engine::SearchIn(readers, request).total;
          if (round > 0) times[who].push_back(ThreadMs() - began);  // the first round warms the caches
        }
      }
    }
    for (const size_t who : {size_t{0}, size_t{1}}) {
      std::sort(times[who].begin(), times[who].end());
      printf("%zu queries %s   p50 %.2f ms, p99 %.2f ms of CPU (%.0f hits each)\n", queries.size(),
             who == 0 ? "of all " : "of half", times[who][times[who].size() / 2],
             times[who][times[who].size() * 99 / 100],
             static_cast<double>(totals[who]) / static_cast<double>(queries.size() * (kRounds + 1)));
    }
  }

  /// How many documents are renamed, and deleted.
  size_t MovedCount() const { return documents_ / 4; }

  /// A chmod of many files: one by one, as a compound, and as one command.
  void MeasureAccess() {
    const size_t count = std::min<size_t>(documents_, 10000);
    const auto measure = [&](const char* name, const Json::Value& request) {
      const std::string text = ferrox::toString(request);
      const double cpu = CpuSec();
      (void)engine_.Handle(text, {});
      const double answered = CpuSec();
      Call("commit");
      printf("%-22s %.1f us of CPU a document, %.1f with the commit\n", name, (answered - cpu) * 1e6 / double(count),
             (CpuSec() - cpu) * 1e6 / double(count));
    };
    Json::Value compound;
    for (size_t number = 0; number < count; ++number) {
      Json::Value& part = compound["compound"].append(Json::Value(Json::objectValue));
      part["command"] = "document_set_by_id";
      part["data"]["id"] = kId;
      part["data"]["doc_id"] = PathOf(number);
      part["data"]["data"]["_KOVAStamp"] = StampOf(number, 1);
      part["data"]["data"]["_KOVAAccess"] = "1000:100:0640";
      part["data"]["data"]["KOVAMDAttributeChangeDate"] = 1500000001;
    }
    measure("rights one by one", compound);
    std::vector<ferrox::wire::SeenAccess> records;
    for (size_t number = 0; number < count; ++number) {
      records.push_back({PathOf(number), StampOf(number, 2), "1000:100:0600"});
    }
    measure("rights at once", ferrox::wire::AccessSetRequest(kId, records));
  }

  void MeasureRename() {
    const size_t count = MovedCount();
    Json::Value request;
    Json::Value& parts = request["compound"] = Json::Value(Json::arrayValue);
    for (size_t number = 0; number < count; ++number) {
      const std::string path = PathOf(number);
      const std::string moved = "/volume1/moved" + path.substr(strlen("/volume1/bench"));
      Json::Value part;
      part["command"] = "document_set_by_id";
      part["data"]["id"] = kId;
      part["data"]["doc_id"] = path;
      part["data"]["data"]["KOVAMDPath"] = moved;
      part["data"]["data"]["KOVAMDParent"] = moved.substr(0, moved.rfind('/'));
      part["data"]["data"]["KOVAMDSearchFileName"] = moved.substr(moved.rfind('/') + 1);
      parts.append(part);
    }
    const double cpu = CpuSec();
    const auto began = SteadyClock::now();
    (void)Send(request);
    const double answered = WallSec(began);
    Call("commit");
    printf("rename %-6zu          %.2f s, with the commit %.2f s, %.2f s of CPU\n", count, answered, WallSec(began),
           CpuSec() - cpu);
    MeasureMove();
  }

  /// There and back, so that what follows finds the documents where they were.
  void MeasureMove() {
    Call("document_upsert_by_id", [](Json::Value& data) {
      data["doc_id"] = "/volume1/moved";
      data["data"]["KOVAMDParent"] = "/volume1";
    });
    for (const auto& [from, to] :
         {std::pair("/volume1/moved", "/volume1/again"), {"/volume1/again", "/volume1/moved"}}) {
      const double cpu = CpuSec();
      const auto began = SteadyClock::now();
      Call("folder_move", [from = from, to = to](Json::Value& data) {
        data["doc_id"] = from;
        data["data"]["KOVAMDPath"] = to;
      });
      Call("commit");
      printf("move of their folder   %.1f ms with the commit, %.1f ms of CPU\n", WallSec(began) * 1000,
             (CpuSec() - cpu) * 1000);
    }
  }

  /// As many documents one by one, and then the folder of the others.
  void MeasureDelete() {
    Json::Value request;
    for (size_t number = MovedCount(); number < 2 * MovedCount(); ++number) {
      Json::Value part;
      part["command"] = "document_del_by_id";
      part["data"]["id"] = kId;
      part["data"]["doc_id"] = PathOf(number);
      request["compound"].append(part);
    }
    double cpu = CpuSec();
    auto began = SteadyClock::now();
    (void)Send(request);
    Call("commit");
    printf("delete %-6zu by one   %.2f s, %.2f s of CPU\n", MovedCount(), WallSec(began), CpuSec() - cpu);

    cpu = CpuSec();
    began = SteadyClock::now();
    Call("document_del_by_query",
         [](Json::Value& data) { data["query"]["qsl"]["prefix"]["KOVAMDPath"] = "/volume1/moved/"; });
    Call("commit");
    const double total =
        Call("search", [](Json::Value& data) { data["query"] = "path:/volume1/moved"; })["total"].asDouble();
    printf("delete of their folder %.3f s until %.0f of them are found, %.2f s of CPU\n", WallSec(began), total,
           CpuSec() - cpu);
    while (Call("index_stat")["clearing"].asInt64() > 0) std::this_thread::sleep_for(std::chrono::milliseconds(50));
    printf("  and cleared          %.2f s, %.2f s of CPU\n", WallSec(began), CpuSec() - cpu);
  }

  std::string folder_;
  size_t documents_;
  size_t text_bytes_;
  ferrox::engine::Engine engine_;
  TextSource source_;
  std::mt19937_64 random_{20240607};
  std::vector<std::string> samples_;
};

}  // namespace

int main(int argc, char** argv) {
  size_t documents = 20000;
  size_t text_bytes = 0;
  std::string folder;
  for (int i = 1; i + 1 < argc; i += 2) {
    if (strcmp(argv[i], "--documents") == 0) documents = strtoul(argv[i + 1], nullptr, 10);
    if (strcmp(argv[i], "--text") == 0) text_bytes = strtoul(argv[i + 1], nullptr, 10);
    if (strcmp(argv[i], "--folder") == 0) folder = argv[i + 1];
  }
  std::string pattern = (folder.empty() ? std::filesystem::temp_directory_path().string() : folder) + "/engine-XXXXXX";
  if (mkdtemp(pattern.data()) == nullptr) return 1;
  Bench(pattern, documents, text_bytes).Run();
  std::filesystem::remove_all(pattern);
  return 0;
}
