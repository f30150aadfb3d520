#include "services/kovaelasticd/store/store_stat.h"

#include <sys/stat.h>

#include <memory>

#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

namespace {

/// The reasons why content could not be read, each with its number of documents and one or two of them.
void ReadFailures(StoreReader& reader, StoreStat& stat) {
  struct Found {
    int64_t count = 0;
    int64_t first = 0;
    int64_t last = 0;
  };
  std::map<std::string, Found, std::less<>> reasons;
  Statement errors = reader.database.Prepare("SELECT error, id FROM docs WHERE error IS NOT NULL ORDER BY error, id");
  while (errors.Step()) {
    if (reader.hidden != nullptr && reader.hidden->Contains(errors.Int(1))) continue;
    auto place = reasons.find(errors.Text(0));
    if (place == reasons.end()) place = reasons.emplace(errors.Text(0), Found{0, errors.Int(1), 0}).first;
    ++place->second.count;
    place->second.last = errors.Int(1);
  }
  for (const auto& [reason, found] : reasons) {
    stat.extract_errors[reason] = found.count;
    for (const int64_t id : {found.first, found.last}) {
      if (id == found.first && !stat.extract_error_examples[reason].empty()) continue;
      const auto example = FindDocument(reader.database, reader.tree, id);
      if (example.has_value()) stat.extract_error_examples[reason].push_back(example->row.path);
    }
  }
}

}  // namespace

int64_t BytesOnDisk(const std::string& path) {
  struct stat status = {};
  return stat(path.c_str(), &status) == 0 ? int64_t{status.st_blocks} * 512 : 0;
}

StoreStat ReadStat(ReaderPool& readers) {
  StoreStat stat;
  std::unique_ptr<StoreReader> reader = readers.Borrow();
  reader->database.Execute("BEGIN");
  reader->Refresh();
  const Totals totals = LoadTotals(reader->database);
  stat.documents = totals.documents;
  stat.with_content = totals.with_content;
  stat.text_bytes = totals.text_bytes;
  stat.without_access = totals.without_access;
  stat.preparing = totals.preparing;
  stat.clearing = totals.clearing;
  ReadFailures(*reader, stat);
  reader->database.Execute("COMMIT");
  for (const char* suffix : {"", "-wal", "-shm"}) stat.bytes_on_disk += BytesOnDisk(reader->database.Path() + suffix);
  readers.Return(std::move(reader));
  return stat;
}

}  // namespace ferrox::engine
