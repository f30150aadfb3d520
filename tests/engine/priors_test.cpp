// Catches what a document is worth by itself going the wrong way, or outweighing a word.
#include "services/kovaelasticd/search/priors.h"

#include <gtest/gtest.h>

#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

TEST(PriorsTest, LittleDecidesWhatIsMeantAmongEquals) {
  struct Case {
    const char* query;
    const char* better;
    const char* worse;
  };
  const Case cases[] = {
      {"plan", "/v/a/new.txt", "/v/a/old.txt"},
      {"plan", "/v/a/old.txt", "/v/a/b/c/d/old.txt"},
      {"plan", "/v/a/b/c/d/old.txt", "/v/a/Backup of B/old.txt"},
      {"plan", "/v/a/b/c/d/old.txt", "/v/a/.local/old.txt"},
      {"plan", "/v/a/.local/old.txt", "/v/a/.local/.cache/deep/old.txt"},
      {"plan", "/v/a/Backup of B/old.txt", "/v/a/.git/old.txt"},
      {"plan", "/v/a/b/c/d/old.txt", "/v/a/Papierkorb/old.txt"},
      {"backup plan", "/v/a/Backup of B/old.txt", "/v/a/b/c/d/old.txt"},
      {"boats photo", "/v/a/old.jpg", "/v/a/old.txt"},
      {"boats -photo", "/v/a/new.txt", "/v/a/old.jpg"},
      {"Bilder (boats OR ships)", "/v/a/b/c/d/old.jpg", "/v/a/new.txt"},
      {"invoice.pdf", "/v/a/b/c/d/old.pdf", "/v/a/new.txt"},
      {"Jahresbericht Präsentation", "/v/a/old.odp", "/v/a/old.pdf"},
  };
  const test::TempDir folder;
  SqliteStore store(folder / "index.sqlite", true, PlainSchema());
  for (const Case& test : cases) {
    for (const std::string path : {test.better, test.worse}) {
      store.Upsert(path, FileDocument(path, "", path.find("new") != path.npos ? 1700000000 : 1500000000));
    }
  }
  store.Commit();
  ReaderPool readers(folder / "index.sqlite");
  const std::unique_ptr<StoreReader> reader = readers.Borrow();
  for (const Case& test : cases) {
    SCOPED_TRACE(test.query);
    Priors priors(*reader, ParseQuery(test.query, 1718000000));
    const auto value = [&](const char* path) {
      const StoredDocument stored = FindDocument(reader->database, reader->tree, path).value();
      std::vector<ScorePart> parts;
      const double sum = priors.Of({stored.folder, *stored.row.mtime, stored.row.kind, stored.row.ext}, &parts);
      double explained = 0;
      for (const ScorePart& part : parts) explained += part.adds;
      EXPECT_DOUBLE_EQ(sum, explained);
      return sum;
    };
    const double better = value(test.better), worse = value(test.worse);
    EXPECT_GT(better, worse) << test.better << " and " << test.worse;
    EXPECT_LT(better - worse, 2) << "a word that every tenth document has must be able to decide";
  }
}

}  // namespace
}  // namespace ferrox::engine
