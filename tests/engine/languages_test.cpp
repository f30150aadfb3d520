// Catches queries in eight languages that miss what answers them: other forms
// of words, accents, compounds. The collection and the answers are in
// data/languages.txt; all languages are in one index.
#include <fstream>
#include <map>
#include <sstream>
#include <string>

#include <gtest/gtest.h>

#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

struct LanguageQuery {
  std::string language;
  std::string text;
  std::vector<std::string> answers;  ///< paths
};

/// The text without the blank at its beginning.
std::string Behind(const std::string& line, size_t pos) { return line.substr(line.find_first_not_of(' ', pos)); }

std::vector<LanguageQuery> ReadCollection(IndexStore& store) {
  std::ifstream file(FERROX_TEST_DATA "/languages.txt");
  std::vector<LanguageQuery> queries;
  std::string language;
  for (std::string line; std::getline(file, line);) {
    if (line.empty() || line[0] == '#') continue;
    if (line[0] == '[') {
      language = line.substr(1, line.size() - 2);
    } else if (line[0] == '?') {
      const size_t end = line.find(" = ");
      LanguageQuery& query = queries.emplace_back(LanguageQuery{language, line.substr(2, end - 2), {}});
      std::istringstream answers(line.substr(end + 3));
      for (std::string name; answers >> name;) query.answers.push_back("/v/" + language + "/" + name);
    } else {
      const size_t end = line.find(':');
      const std::string path = "/v/" + language + "/" + line.substr(0, end);
      store.Upsert(path, FileDocument(path, Behind(line, end + 1)));
    }
  }
  store.Commit();
  return queries;
}

TEST(LanguagesTest, NineOfTenAnswersAreAmongTheFirstTenHits) {
  struct Sum {
    double recall = 0;
    int queries = 0, first = 0;
    std::string missed;
  };
  const test::TempDir folder;
  SqliteStore store(folder / "index.sqlite", true, PlainSchema());
  std::map<std::string, Sum> sums;
  for (const LanguageQuery& query : ReadCollection(store)) {
    SearchRequest request;
    request.limit = 10;
    const SearchReply reply = Find(store, query.text, request);
    double found = 0;
    for (const std::string& answer : query.answers) {
      const auto is_it = [&answer](const SearchHit& hit) { return hit.path == answer; };
      found += std::any_of(reply.hits.begin(), reply.hits.end(), is_it) ? 1 : 0;
    }
    Sum& sum = sums[query.language];
    ++sum.queries;
    sum.recall += found / static_cast<double>(query.answers.size());
    const auto& answers = query.answers;
    if (!reply.hits.empty()) sum.first += std::count(answers.begin(), answers.end(), reply.hits[0].path) > 0 ? 1 : 0;
    if (found < static_cast<double>(answers.size())) sum.missed += "\n" + query.text;
  }
  EXPECT_EQ(sums.size(), 8U);
  for (const auto& [language, sum] : sums) {
    RecordProperty(language + "_recall", std::to_string(sum.recall / sum.queries));
    RecordProperty(language + "_first", sum.first);
    EXPECT_EQ(sum.queries, 20) << language;
    EXPECT_GE(sum.recall / sum.queries, 0.9) << language << " missed:" << sum.missed;
  }
}

}  // namespace
}  // namespace ferrox::engine
