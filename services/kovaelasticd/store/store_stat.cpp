#include "services/kovaelasticd/store/store_stat.h"

#include <sys/stat.h>

#include <memory>

#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

namespace {

/// The reasons why content could not be read, each with its number of documents and one or two of them.
void ReadFailures(StoreReader& reader, StoreStat& stat) {
  Statement errors = reader.database.Prepare(
      "SELECT error, count(*), min(id), max(id) FROM docs WHERE error IS NOT NULL GROUP BY error");
  while (errors.Step()) {
    const std::string reason(errors.Text(0));
    stat.extract_errors[reason] = errors.Int(1);
    for (int column = 2; column <= (errors.Int(1) == 1 ? 2 : 3); ++column) {
      const auto example = FindDocument(reader.database, reader.tree, errors.Int(column));
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
  ReadFailures(*reader, stat);
  reader->database.Execute("COMMIT");
  for (const char* suffix : {"", "-wal", "-shm"}) stat.bytes_on_disk += BytesOnDisk(reader->database.Path() + suffix);
  readers.Return(std::move(reader));
  return stat;
}

}  // namespace ferrox::engine
