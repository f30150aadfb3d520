#include "services/kovaelasticd/search/sqlite_search.h"

#include <memory>
#include <optional>
#include <utility>

#include "services/kovaelasticd/search/column_order.h"
#include "services/kovaelasticd/search/complete.h"
#include "services/kovaelasticd/store/file_links.h"
#include "services/kovaelasticd/store/packed_fields.h"
#include "services/kovaelasticd/store/sqlite_store.h"
#include "services/kovaelasticd/store/suggest.h"
#include "services/kovaelasticd/store/work_limit.h"
#include "services/kovaelasticd/text/snippet.h"

namespace ferrox::engine {

/// Orders what was found, and loads the hits that are asked for.
void Searcher::PutPage(const FoundDocuments& found, const FoundWords& words, SearchReply& reply) {
  RelevanceRanking ranking(reader_, visible_, words.ranked, request_, constants_);
  const auto begin = static_cast<size_t>(request_.offset);
  const PageOrder order = {begin, begin + static_cast<size_t>(request_.limit), request_.ascending};
  const bool by_relevance = request_.sort == SortKey::kRelevance;
  const std::vector<RankedDocument> page =
      by_relevance ? ranking.Page(found.documents, reply.total, order, reply.ranking_bounded)
                   : ColumnOrder(reader_, visible_, request_).Page(found.documents, reply.total);
  for (const RankedDocument& ranked : page) {
    WorkLimit::Check();
    SearchHit& hit = reply.hits.emplace_back(LoadHit(ranked, words));
    hit.has_all = !found.with_all.has_value() || found.with_all->Contains(ranked.id);
    if (request_.explain && by_relevance) hit.explanation = ranking.Explain(ranked.id);
  }
}

// What a hit takes in memory, roughly: beside its fields, and these by their packed bytes.
constexpr size_t kHitBytes = 1024;
constexpr size_t kFieldsTimes = 8;

/// A hit as it is shown. The text is unpacked only for a snippet, so a page unpacks as many texts as it has hits.
SearchHit Searcher::LoadHit(const RankedDocument& ranked, const FoundWords& words) {
  SearchHit hit;
  hit.score = ranked.score;
  hit.number_key = ranked.number_key;
  hit.name_key = ranked.name_key;
  const std::optional<StoredDocument> stored = FindDocument(reader_.database, reader_.tree, ranked.id);
  if (!stored.has_value()) return hit;
  WorkLimit::Require(kHitBytes + kFieldsTimes * stored->row.packed.size());
  hit.path = stored->row.path;
  hit.is_folder = stored->row.kind == kFolder;
  hit.stamp = TextField(stored->row.packed, reader_.names.NumberOf(FileLinks::kStamp)).value_or("");
  hit.fields = UnpackDocument(stored->row, reader_.names, {});
  hit.title = stored->row.title;
  if (hit.title.empty()) hit.title = TextField(stored->row.packed, reader_.names.NumberOf(field::kTitle)).value_or("");
  if (!request_.snippet || words.marked.empty() || stored->text_bytes == 0) return hit;
  Statement body = reader_.database.Prepare("SELECT zstd FROM bodies WHERE id = ?1");
  if (body.Bind(1, ranked.id).Step()) {
    hit.snippet = MakeSnippet(reader_.codec.Unpack(body.Text(0)), words.marked, request_.mark_start, request_.mark_end,
                              {stored->row.language, hit.title});
  }
  return hit;
}

SearchReply Searcher::Run() {
  if (!request_.completed.empty()) {
    SearchReply reply;
    reply.completions = CompleteWord(reader_, visible_, request_.completed, static_cast<size_t>(request_.limit));
    return reply;
  }
  const bool by_relevance = request_.sort == SortKey::kRelevance;
  QueryEvaluator evaluator(reader_, visible_, by_relevance ? request_.ranked_max : 0, constants_, request_);
  FoundDocuments found = evaluator.Find(*request_.query, request_.all_words || !by_relevance);
  SearchReply reply;
  reply.total = found.documents.Count();
  if (found.with_all.has_value()) reply.total_all = found.with_all->Count();
  reply.ignored = std::move(found.ignored);
  reply.repaired = std::move(found.repaired);
  reply.synonyms = std::move(found.synonyms);
  reply.documents = std::move(found.word_documents);
  reply.none_has_all = found.none_has_all;
  reply.hints = evaluator.Words().hints;
  PutPage(found, evaluator.Words(), reply);
  if (reply.total == 0) {
    const std::vector<std::string>& words = evaluator.Words().looked_for;
    reply.suggestions =
        visible_.IsForAsker() ? SuggestVisible(reader_.database, words, visible_) : Suggest(reader_.database, words);
  }
  return reply;
}

SearchReply SearchIn(ReaderPool& readers, const SearchRequest& request) {
  std::unique_ptr<StoreReader> reader = readers.Borrow();
  reader->database.Execute("BEGIN");
  reader->Refresh();
  static const RankingConstants kConstants;
  SearchReply reply = Searcher(*reader, request, kConstants).Run();
  reader->database.Execute("COMMIT");
  readers.Return(std::move(reader));
  return reply;
}

SearchReply SqliteStore::Search(const SearchRequest& request) { return SearchIn(readers_, request); }

}  // namespace ferrox::engine
