// Random changes and queries: the index and a naive model, which looks at every document, must agree on what is found.
#include <map>
#include <random>
#include <string>

#include <gtest/gtest.h>

#include "services/kovaelasticd/text/words.h"
#include "tests/engine/store_helpers.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

struct ModelDocument {
  std::string text;
  int64_t size = 0;
  int64_t mtime = 0;
};
using Model = std::map<std::string, ModelDocument>;

std::vector<std::string> WordsOf(const std::string& text) {
  std::vector<std::string> words;
  WordScanner scanner(text);
  while (scanner.Next()) words.emplace_back(scanner.Word());
  return words;
}

bool HasSequence(const std::string& text, const std::vector<std::string>& sequence, bool prefix) {
  const std::vector<std::string> words = WordsOf(text);
  const auto same = [&](const std::string& word, const std::string& wanted) {
    return word == wanted || (prefix && &wanted == &sequence.back() && word.rfind(wanted, 0) == 0);
  };
  return std::search(words.begin(), words.end(), sequence.begin(), sequence.end(), same) != words.end();
}

/// Whether a document is found, decided condition by condition, without any index.
bool Matches(const QueryNode& node, const std::string& path, const ModelDocument& document) {
  const std::string name = path.substr(path.rfind('/') + 1);
  const auto matches = [&](const QueryNode& child) { return Matches(child, path, document); };
  switch (node.type) {
    case QueryNode::Type::kAnd:
      return std::all_of(node.children.begin(), node.children.end(), matches);
    case QueryNode::Type::kOr:
      return std::any_of(node.children.begin(), node.children.end(), matches);
    case QueryNode::Type::kNot:
      return !matches(node.children.front());
    case QueryNode::Type::kExt:
      return name.substr(name.rfind('.') + 1) == node.text;
    case QueryNode::Type::kPath:
      return path.rfind(node.text + "/", 0) == 0 || path == node.text;
    case QueryNode::Type::kSize:
      return document.size >= node.low && document.size <= node.high;
    case QueryNode::Type::kDate:
      return document.mtime >= node.low && document.mtime <= node.high;
    default:
      break;
  }
  const QueryWords words = SplitQueryText(node.text, node.prefix);
  const bool by_part =
      !node.phrase && FoldText(node.text).size() >= 3 && FoldText(name).find(FoldText(node.text)) != std::string::npos;
  if (by_part || HasSequence(name, words.words, words.prefix)) return true;
  return node.type == QueryNode::Type::kText && HasSequence(document.text, words.words, words.prefix);
}

bool IsSoft(const QueryNode& node) { return node.type == QueryNode::Type::kText && !node.required; }

/// Whether a document is found that need not have all plain words, given which of them were ignored.
bool MatchesSoftly(const QueryNode& query, const std::vector<std::string>& ignored, const std::string& path,
                   const ModelDocument& document) {
  if (query.type != QueryNode::Type::kAnd) return Matches(query, path, document);
  size_t counting = 0;
  bool any = false;
  for (const QueryNode& child : query.children) {
    const bool matches = Matches(child, path, document);
    if (!IsSoft(child) && !matches) return false;
    if (!IsSoft(child) || std::count(ignored.begin(), ignored.end(), FoldText(child.text)) != 0) continue;
    ++counting;
    any = any || matches;
  }
  return any || counting == 0;
}

class SearchModelTest : public testing::Test {
 protected:
  size_t Random(size_t below) { return static_cast<size_t>(random_() % below); }
  std::string Word() {
    static const char* const kWords[] = {"alpha", "beta", "Betamax", "gam-ma", "delta_x",
                                         "ép",    "東京", "x",       "omega",  "al"};
    return kWords[Random(std::size(kWords))];
  }
  std::string Path() {
    static const char* const kEndings[] = {".txt", ".pdf", ".jpg"};
    return "/v/d" + std::to_string(Random(3)) + "/" + Word() + std::to_string(Random(3)) + kEndings[Random(3)];
  }
  std::string Text() {
    std::string text;
    for (size_t i = Random(12); i > 0; --i) text += Word() + (Random(6) == 0 ? ". " : " ");
    return text;
  }
  std::string Condition() {
    const std::string conditions[] = {"\"" + Word() + " " + Word() + "\"",
                                      Random(2) == 0 ? "al*" : "bet*",
                                      "name:" + Word(),
                                      Random(2) == 0 ? "ext:txt" : "ext:jpg",
                                      "path:/v/d" + std::to_string(Random(3)),
                                      "size:>" + std::to_string(Random(60)),
                                      "date:20" + std::to_string(20 + Random(4))};
    const size_t choice = Random(9);
    return choice < std::size(conditions) ? conditions[choice] : Word();
  }
  std::string Query() {
    std::string query;
    for (size_t i = Random(3) + 1; i > 0; --i) {
      if (Random(5) == 0) query += "-";
      query += Random(5) == 0 ? "(" + Condition() + " OR " + Condition() + ") " : Condition() + " ";
      if (i > 1 && Random(6) == 0) query += "OR ";
    }
    return query;
  }

  void Change() {
    const std::string path = Path();
    if (Random(6) == 0) {
      store_.Delete(path);
      model_.erase(path);
    } else if (Random(6) == 0 && model_.count(path) != 0) {
      Move(path, Path());
    } else {
      ModelDocument document{Text(), 0, 1577836800 + static_cast<int64_t>(Random(4 * 365 * 86400))};
      document.size = static_cast<int64_t>(document.text.size());
      store_.Upsert(path, FileDocument(path, document.text, document.mtime));
      model_[path] = document;
    }
  }
  void Move(const std::string& from, const std::string& to) {
    Json::Value changes = FileDocument(to);
    for (const char* name : {"KOVAMDFSSize", "KOVAMDFSContentChangeDate"}) changes.removeMember(name);
    store_.Set(from, changes);
    const ModelDocument moved = model_[from];
    model_.erase(from);
    model_[to] = moved;
  }

  std::mt19937 random_{20240610};
  test::TempDir folder_;
  SqliteStore store_{folder_ / "index.sqlite", true, PlainSchema()};
  Model model_;
};

TEST_F(SearchModelTest, EveryQueryFindsWhatTheModelFinds) {
  size_t found = 0;
  for (int round = 0; round < 40; ++round) {
    for (size_t i = Random(20); i > 0; --i) Change();
    store_.Commit();
    ASSERT_EQ(store_.Stat().documents, static_cast<int64_t>(model_.size()));
    for (int i = 0; i < 15; ++i) {
      const std::string text = Query();
      SCOPED_TRACE("round " + std::to_string(round) + ": " + text);
      const QueryNode query = ParseQuery(text, 1718000000);
      SearchRequest request;
      request.limit = 1000;
      request.sort = static_cast<SortKey>(i % 4);
      const SearchReply reply = Find(store_, text, request);
      std::string expected, expected_all;
      int64_t total = 0, total_all = 0;
      for (const auto& [path, document] : model_) {
        const auto add = [&path = path](std::string& paths) { paths += (paths.empty() ? "" : "\n") + path; };
        if (MatchesSoftly(query, reply.ignored, path, document)) add(expected), ++total;
        if (Matches(query, path, document)) add(expected_all), ++total_all;
      }
      const bool needs_all = request.sort != SortKey::kRelevance && total_all > 0;
      ASSERT_EQ(Paths(reply), needs_all ? expected_all : expected);
      ASSERT_EQ(reply.total, needs_all ? total_all : total);
      ASSERT_EQ(reply.total_all.value_or(reply.total), total_all);
      ASSERT_EQ(reply.none_has_all, request.sort != SortKey::kRelevance && total_all == 0 && total > 0);
      found += total > 0 ? 1 : 0;
    }
  }
  EXPECT_GT(found, 280U) << "the queries must find something for the comparison to mean anything";
}

}  // namespace
}  // namespace ferrox::engine
