#include "services/kovaelasticd/search/sqlite_search.h"

#include <algorithm>
#include <iterator>
#include <limits>
#include <memory>
#include <utility>

#include "services/kovaelasticd/store/sqlite_store.h"
#include "services/kovaelasticd/store/suggest.h"
#include "services/kovaelasticd/text/snippet.h"

namespace ferrox::engine {

namespace {

/// Up to so many documents, their rows are read and sorted; the walk along a column's index would pass over too many
/// others to find them.
constexpr int64_t kFetchForOrderMax = 5000;

}  // namespace

std::vector<RankedDocument> Searcher::OrderByRelevance(const DocSet& documents, const Totals& totals,
                                                       const FoundWords& words, SearchReply& reply) {
  const double with_content = std::max<double>(1, static_cast<double>(totals.with_content));
  const double average_text = std::max(1.0, static_cast<double>(totals.text_bytes) / with_content);
  RelevanceRanking ranking(reader_.database, words.ranked, average_text, request_.ranked_max);
  const PageOrder order = {static_cast<size_t>(request_.offset), Needed(), request_.ascending};
  return ranking.Page(documents, reply.total, order, reply.ranking_bounded);
}

/// Few documents: their keys are fetched and sorted.
std::vector<RankedDocument> Searcher::OrderFetched(const DocSet& documents) {
  std::vector<RankedDocument> ranked;
  const SortKey sort = request_.sort;
  Statement statement = reader_.database.Prepare("SELECT mtime, size, name FROM docs WHERE id = ?1");
  documents.ForEach([&](int64_t id) {
    if (statement.Bind(1, id).Step()) {
      const int column = sort == SortKey::kDate ? 0 : 1;
      const int64_t number = statement.IsNull(column) ? std::numeric_limits<int64_t>::min() : statement.Int(column);
      RankedDocument entry{id};
      if (sort == SortKey::kName) {
        entry.name_key = statement.Text(2);
      } else {
        entry.number_key = number;
      }
      ranked.push_back(std::move(entry));
    }
    statement.Reset();
    return true;
  });
  const auto less = [](const RankedDocument& a, const RankedDocument& b) {
    if (a.number_key != b.number_key) return a.number_key < b.number_key;
    const int names = CompareNames(a.name_key, b.name_key);
    return names != 0 ? names < 0 : a.id < b.id;
  };
  const bool ascending = request_.ascending;
  std::sort(ranked.begin(), ranked.end(),
            [&](const RankedDocument& a, const RankedDocument& b) { return ascending ? less(a, b) : less(b, a); });
  return ranked;
}

/// Many documents: the column's index is walked until the page is full.
std::vector<RankedDocument> Searcher::OrderByWalk(const DocSet& documents) {
  const char* column = request_.sort == SortKey::kDate ? "mtime" : request_.sort == SortKey::kSize ? "size" : "name";
  const std::string direction = request_.ascending ? " ASC" : " DESC";
  Statement statement = reader_.database.Prepare("SELECT id, " + std::string(column) + " FROM docs ORDER BY " + column +
                                                 direction + ", id" + direction);
  std::vector<RankedDocument> ranked;
  while (ranked.size() < Needed() && statement.Step()) {
    if (!documents.Contains(statement.Int(0))) continue;
    RankedDocument entry{statement.Int(0)};
    if (request_.sort == SortKey::kName) {
      entry.name_key = statement.Text(1);
    } else {
      entry.number_key = statement.IsNull(1) ? std::numeric_limits<int64_t>::min() : statement.Int(1);
    }
    ranked.push_back(std::move(entry));
  }
  return ranked;
}

/// The page by date, size or name; documents without date or size come as if theirs were below all others.
std::vector<RankedDocument> Searcher::OrderByColumn(const DocSet& documents, int64_t total) {
  std::vector<RankedDocument> ranked = total <= kFetchForOrderMax ? OrderFetched(documents) : OrderByWalk(documents);
  ranked.resize(std::min(ranked.size(), Needed()), RankedDocument(0));
  ranked.erase(ranked.begin(), ranked.begin() + std::min<ptrdiff_t>(request_.offset, std::ssize(ranked)));
  return ranked;
}

/// A hit as it is shown. The text is unpacked only for a snippet, so a page unpacks as many texts as it has hits.
SearchHit Searcher::LoadHit(const RankedDocument& ranked, const FoundWords& words) {
  SearchHit hit;
  hit.score = ranked.score;
  hit.number_key = ranked.number_key;
  hit.name_key = ranked.name_key;
  const std::optional<StoredDocument> stored = FindDocument(reader_.database, reader_.tree, ranked.id);
  if (!stored.has_value()) return hit;
  hit.path = stored->row.path;
  hit.fields = UnpackDocument(stored->row, reader_.names, {});
  if (!request_.snippet || words.marked.empty() || stored->text_bytes == 0) return hit;
  Statement body = reader_.database.Prepare("SELECT zstd FROM bodies WHERE id = ?1");
  if (body.Bind(1, ranked.id).Step()) {
    hit.snippet = MakeSnippet(reader_.codec.Unpack(body.Text(0)), words.marked, request_.mark_start, request_.mark_end);
  }
  return hit;
}

SearchReply Searcher::Run() {
  const Totals totals = LoadTotals(reader_.database);
  QueryEvaluator evaluator(reader_, totals, request_.ranked_max);
  const DocSet documents = evaluator.Evaluate(*request_.query);
  SearchReply reply;
  reply.total = documents.Count();
  const std::vector<RankedDocument> page = request_.sort == SortKey::kRelevance
                                               ? OrderByRelevance(documents, totals, evaluator.Words(), reply)
                                               : OrderByColumn(documents, reply.total);
  for (const RankedDocument& ranked : page) reply.hits.push_back(LoadHit(ranked, evaluator.Words()));
  if (reply.total == 0) reply.suggestions = Suggest(reader_.database, evaluator.Words().looked_for);
  return reply;
}

SearchReply SearchIn(ReaderPool& readers, const SearchRequest& request) {
  std::unique_ptr<StoreReader> reader = readers.Borrow();
  reader->database.Execute("BEGIN");
  reader->Refresh();
  SearchReply reply = Searcher(*reader, request).Run();
  reader->database.Execute("COMMIT");
  readers.Return(std::move(reader));
  return reply;
}

SearchReply SqliteStore::Search(const SearchRequest& request) { return SearchIn(readers_, request); }

}  // namespace ferrox::engine
