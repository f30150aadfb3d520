#include "services/kovaelasticd/sqlite_search.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <numeric>
#include <tuple>
#include <utility>

#include "base/path.h"
#include "common/clock.h"
#include "fileindex/util.h"
#include "services/kovaelasticd/words.h"

namespace ferrox::engine {

namespace {

/// Documents whose order is settled by the close score lie in blocks of this many in the order of the quick score. The
/// blocks are the same whichever page is asked for, so pages neither repeat nor miss a hit; a page reads the lengths
/// and dates of the one to three blocks that it touches, about 1 ms each.
constexpr size_t kCloseBlock = 500;
constexpr int64_t kDaySec = 86400;
/// A condition is checked document by document when there are no more of them.
constexpr int64_t kCheckOneByOneMax = 2000;
constexpr int64_t kFetchForOrderMax = 5000;
constexpr size_t kGramsMax = 32;

bool IsWords(QueryNode::Type type) {
  return type == QueryNode::Type::kText || type == QueryNode::Type::kField || type == QueryNode::Type::kName;
}

bool IsFilter(QueryNode::Type type) {
  return type == QueryNode::Type::kExt || type == QueryNode::Type::kKind || type == QueryNode::Type::kPath ||
         type == QueryNode::Type::kSize || type == QueryNode::Type::kDate || type == QueryNode::Type::kRange;
}

int32_t KindOfExtension(const std::string& ext) {
  return static_cast<int32_t>(fileindex::GetFileTypeByFullPath("." + ext));
}

std::string GramExpression(const std::string& text) {
  const std::vector<std::string> grams = Trigrams(text, kGramsMax);
  return grams.empty() ? std::string() : "{grams} : " + PhraseExpression(grams, false);
}

void AppendOr(std::string& expression, const std::string& alternative) {
  if (alternative.empty()) return;
  if (!expression.empty()) expression += " OR ";
  expression += "(" + alternative + ")";
}

/// How much a word's places beside the content count.
double PlaceValue(uint8_t places) {
  double value = 0;
  if ((places & kInName) != 0) value += 2.5;
  if ((places & (kInName | kInNamePart)) == kInNamePart) value += 1.0;
  if ((places & kInTitle) != 0) value += 1.5;
  if ((places & kInText) != 0) value += 0.8;
  return value;
}

/// What ages count from, in seconds since the epoch: the same all day, so that pages asked one after the other agree.
int64_t EndOfDay() { return (Clock::Get().Now() / kDaySec + 1) * kDaySec; }

/// How much its number of occurrences counts: the more, the less each.
double CountValue(uint8_t count, double length_factor) { return count * 2.2 / (count + 1.2 * length_factor); }

}  // namespace

DocSet Searcher::Evaluate(const QueryNode& node, bool ranking) {
  switch (node.type) {
    case QueryNode::Type::kAll:
      return AllDocuments();
    case QueryNode::Type::kAnd:
      return EvaluateAll(node, ranking);
    case QueryNode::Type::kOr: {
      DocSet found;
      for (const QueryNode& child : node.children) found.UniteWith(Evaluate(child, ranking));
      return found;
    }
    case QueryNode::Type::kNot: {
      DocSet found = AllDocuments();
      found.Subtract(Evaluate(node.children.front(), false));
      return found;
    }
    default:
      return IsWords(node.type) ? EvaluateWords(node, ranking) : EvaluateFilter(node);
  }
}

/// Words first, since they leave the fewest documents; then what is joined of them; conditions on columns after that,
/// and exclusions last.
DocSet Searcher::EvaluateAll(const QueryNode& node, bool ranking) {
  DocSet found;
  bool any = false;
  const auto intersect = [&](const QueryNode& child) {
    if (any) {
      found.IntersectWith(Evaluate(child, ranking));
    } else {
      found = Evaluate(child, ranking);
    }
    any = true;
  };
  for (const QueryNode& child : node.children) {
    if (IsWords(child.type)) intersect(child);
  }
  for (const QueryNode& child : node.children) {
    if (child.type == QueryNode::Type::kAnd || child.type == QueryNode::Type::kOr) intersect(child);
  }
  for (const QueryNode& child : node.children) {
    if (!IsFilter(child.type)) continue;
    if (any) {
      ApplyFilter(found, child, true);
    } else {
      intersect(child);
    }
  }
  if (!any) found = AllDocuments();
  for (const QueryNode& child : node.children) {
    if (child.type != QueryNode::Type::kNot) continue;
    const QueryNode& excluded = child.children.front();
    if (IsFilter(excluded.type)) {
      ApplyFilter(found, excluded, false);
    } else {
      found.Subtract(Evaluate(excluded, false));
    }
  }
  return found;
}

DocSet Searcher::AllDocuments() {
  DocSet found;
  Statement statement = reader_.database.Prepare("SELECT id FROM docs");
  while (statement.Step()) found.Add(statement.Int(0));
  return found;
}

DocSet Searcher::EvaluateFilter(const QueryNode& node) {
  DocSet found;
  const auto collect = [&found](Statement& statement) {
    while (statement.Step()) found.Add(statement.Int(0));
    statement.Reset();
  };
  Database& database = reader_.database;
  if (node.type == QueryNode::Type::kKind) {
    Statement statement = database.Prepare("SELECT id FROM docs WHERE kind = ?1");
    for (const int32_t kind : node.kinds) collect(statement.Bind(1, int64_t{kind}));
  } else if (node.type == QueryNode::Type::kExt) {
    Statement statement = database.Prepare("SELECT id FROM docs WHERE kind IN (?1, ?2) AND ext = ?3");
    statement.Bind(1, int64_t{KindOfExtension(node.text)}).Bind(2, int64_t{kFolder});
    collect(statement.Bind(3, std::string_view(node.text)));
  } else if (node.type == QueryNode::Type::kPath) {
    const std::string begin = node.text + "/";
    const std::string end = node.text + "0";  // the character behind "/"
    Statement statement = database.Prepare("SELECT id FROM docs WHERE path >= ?1 AND path < ?2");
    collect(statement.Bind(1, std::string_view(begin)).Bind(2, std::string_view(end)));
    Statement itself = database.Prepare("SELECT id FROM docs WHERE path = ?1");
    collect(itself.Bind(1, std::string_view(node.text)));
  } else if (node.type == QueryNode::Type::kRange) {
    Statement statement = database.Prepare("SELECT doc FROM temp.meta_terms WHERE term >= ?1 AND term <= ?2");
    for (const std::string& name : node.fields) {
      const std::string low = RangeWord(name, node.low);
      const std::string high = RangeWord(name, node.high);
      collect(statement.Bind(1, std::string_view(low)).Bind(2, std::string_view(high)));
    }
  } else {
    Statement statement =
        database.Prepare(node.type == QueryNode::Type::kSize ? "SELECT id FROM docs WHERE size BETWEEN ?1 AND ?2"
                                                             : "SELECT id FROM docs WHERE mtime BETWEEN ?1 AND ?2");
    collect(statement.Bind(1, node.low).Bind(2, node.high));
  }
  return found;
}

/// Keeps the documents for which the condition holds, or does not: by looking at each when they are few.
void Searcher::ApplyFilter(DocSet& documents, const QueryNode& filter, bool wanted) {
  if (documents.Count() > kCheckOneByOneMax || filter.type == QueryNode::Type::kRange) {
    const DocSet matching = EvaluateFilter(filter);
    wanted ? documents.IntersectWith(matching) : documents.Subtract(matching);
    return;
  }
  std::vector<int64_t> failing;
  documents.ForEach([&](int64_t id) {
    if (MatchesFilter(id, filter) != wanted) failing.push_back(id);
    return true;
  });
  for (const int64_t id : failing) documents.Remove(id);
}

bool Searcher::MatchesFilter(int64_t id, const QueryNode& filter) {
  Statement statement = reader_.database.Prepare("SELECT kind, ext, size, mtime, path FROM docs WHERE id = ?1");
  statement.Bind(1, id);
  if (!statement.Step()) return false;
  const auto in_range = [&](int column) {
    return !statement.IsNull(column) && statement.Int(column) >= filter.low && statement.Int(column) <= filter.high;
  };
  switch (filter.type) {
    case QueryNode::Type::kKind:
      return std::find(filter.kinds.begin(), filter.kinds.end(), static_cast<int32_t>(statement.Int(0))) !=
             filter.kinds.end();
    case QueryNode::Type::kExt:
      return statement.Text(1) == filter.text;
    case QueryNode::Type::kSize:
      return in_range(2);
    case QueryNode::Type::kDate:
      return in_range(3);
    default:
      return base::IsAtOrBelow(statement.Text(4), filter.text);
  }
}

void Searcher::CollectWords(const QueryNode& node, HitCollector& content, HitCollector& meta) {
  const QueryWords words = SplitQueryText(node.text, node.prefix);
  const std::string phrase = PhraseExpression(words.words, words.prefix);
  std::string meta_expression;
  bool in_content = node.type == QueryNode::Type::kText;
  if (node.type == QueryNode::Type::kField) {
    for (const std::string& name : node.fields) {
      if (name == field::kTextContent) {
        in_content = true;
        continue;
      }
      std::vector<std::string> marked = words.words;
      for (std::string& word : marked) word.insert(0, name + kFieldEnd);
      AppendOr(meta_expression, "{fields} : " + PhraseExpression(marked, words.prefix));
    }
  } else {
    const bool names_only = node.type == QueryNode::Type::kName;
    AppendOr(meta_expression, (names_only ? "{name} : " : "{name title text} : ") + phrase);
    if (names_only || !node.phrase) AppendOr(meta_expression, GramExpression(node.text));
  }
  if (in_content) Collect(reader_.database, "content_fts", phrase, words.prefix, content);
  if (!meta_expression.empty()) Collect(reader_.database, "meta_fts", meta_expression, words.prefix, meta);
}

DocSet Searcher::EvaluateWords(const QueryNode& node, bool ranking) {
  HitCollector content(request_.ranked_max);
  HitCollector meta(request_.ranked_max);
  CollectWords(node, content, meta);
  DocSet found = content.TakeSet();
  found.UniteWith(meta.Set());
  if (ranking) {
    Term term;
    term.weight = std::log(1.0 + static_cast<double>(documents_) / static_cast<double>(1 + found.Count()));
    term.content = content.TakeHits();
    term.meta = meta.TakeHits();
    terms_.push_back(std::move(term));
    const QueryWords words = SplitQueryText(node.text, node.prefix);
    for (const std::string& word : words.words) {
      marked_.push_back({word, words.prefix && &word == &words.words.back()});
      words_.push_back(word);
    }
  }
  return found;
}

/// The documents worth ranking: all, or the newest added of them.
std::vector<Searcher::Candidate> Searcher::Candidates(const DocSet& documents, int64_t total, bool& bounded) {
  std::vector<Candidate> candidates;
  const int64_t skip = std::max<int64_t>(0, total - static_cast<int64_t>(request_.ranked_max));
  bounded = skip > 0;
  candidates.reserve(static_cast<size_t>(total - skip));
  DocSet by_name;
  if (bounded) {
    for (const Term& term : terms_) {
      for (const WordHit& hit : term.meta) by_name.Add(hit.id);
    }
  }
  int64_t place = 0;
  documents.ForEach([&](int64_t id) {
    if (place++ >= skip || by_name.Contains(id)) candidates.push_back({id, 0, 0});
    return true;
  });
  return candidates;
}

/// How long the document's text is compared with others; `freshness` becomes the share of the score for its age.
double Searcher::LengthFactor(int64_t id, double& freshness) {
  Statement statement = reader_.database.Prepare("SELECT text_bytes, mtime FROM docs WHERE id = ?1");
  statement.Bind(1, id);
  freshness = 0;
  if (!statement.Step()) return 1;
  const double age_days = std::max(0.0, static_cast<double>(EndOfDay() - statement.Int(1)) / kDaySec);
  freshness = 0.3 / (1 + age_days / 180);
  return 0.3 + 0.7 * static_cast<double>(statement.Int(0)) / average_text_;
}

/// Finds the hits of a word among candidates in the order of their numbers; calls `take` with the place and the hit.
template <typename Take>
void Searcher::ForEachCandidateHit(const std::vector<Candidate>& candidates, const std::vector<WordHit>& hits,
                                   Take take) {
  size_t place = 0;
  int64_t before = 0;
  for (const WordHit& hit : hits) {
    if (hit.id < before) place = 0;  // the hits of the next phrase begin
    before = hit.id;
    while (place < candidates.size() && candidates[place].id < hit.id) ++place;
    if (place < candidates.size() && candidates[place].id == hit.id) take(place, hit);
  }
}

/// Scores all candidates by the words' hits alone; `counts` becomes the words' occurrences, candidate by candidate.
void Searcher::ScoreAtFirstSight(std::vector<Candidate>& candidates, std::vector<uint8_t>& counts) {
  counts.assign(candidates.size() * terms_.size(), 0);
  for (size_t t = 0; t < terms_.size(); ++t) {
    const double weight = terms_[t].weight;
    ForEachCandidateHit(candidates, terms_[t].content, [&](size_t place, const WordHit& hit) {
      counts[place * terms_.size() + t] = hit.count;
      candidates[place].score += static_cast<float>(weight * CountValue(hit.count, 1));
    });
    ForEachCandidateHit(candidates, terms_[t].meta, [&](size_t place, const WordHit& hit) {
      const auto value = static_cast<float>(weight * PlaceValue(hit.places));
      candidates[place].score += value;
      candidates[place].place_score += value;
    });
  }
}

/// The places of the candidates that stand from `begin` to `end` in the order of the quick score, in no order.
std::vector<size_t> Searcher::PlacesBetween(const std::vector<Candidate>& candidates, size_t begin, size_t end) {
  std::vector<size_t> places(candidates.size());
  std::iota(places.begin(), places.end(), size_t{0});
  const auto better = [&](size_t a, size_t b) {
    return candidates[a].score != candidates[b].score ? candidates[a].score > candidates[b].score : a > b;
  };
  const auto first = places.begin() + static_cast<ptrdiff_t>(begin);
  const auto last = places.begin() + static_cast<ptrdiff_t>(end);
  if (last != places.end()) std::nth_element(places.begin(), last, places.end(), better);
  if (first != last) std::nth_element(places.begin(), first, last, better);
  return {first, last};
}

/// The score with the length of the text and its age.
double Searcher::CloseScore(const Candidate& candidate, const uint8_t* counts) {
  double score = 0;
  const double length = LengthFactor(candidate.id, score);
  score += static_cast<double>(candidate.place_score);
  for (size_t t = 0; t < terms_.size(); ++t) {
    if (counts[t] > 0) score += terms_[t].weight * CountValue(counts[t], length);
  }
  return score;
}

/// The block of candidates from `begin` to `end` in the order of the quick score, sorted by the close one.
std::vector<Searcher::Ranked> Searcher::RankBlock(const std::vector<Candidate>& candidates,
                                                  const std::vector<uint8_t>& counts, size_t begin, size_t end) {
  std::vector<Ranked> ranked;
  ranked.reserve(end - begin);
  for (const size_t place : PlacesBetween(candidates, begin, end)) {
    Ranked entry(candidates[place].id);
    entry.score = CloseScore(candidates[place], counts.data() + place * terms_.size());
    ranked.push_back(std::move(entry));
  }
  std::sort(ranked.begin(), ranked.end(),
            [](const Ranked& a, const Ranked& b) { return a.score != b.score ? a.score > b.score : a.id > b.id; });
  return ranked;
}

/// The page itself: of all candidates, best first, those from `offset` on; the other way round, counted from the end.
std::vector<Searcher::Ranked> Searcher::RankByRelevance(const DocSet& documents, int64_t total, bool& bounded) {
  std::vector<Candidate> candidates = Candidates(documents, total, bounded);
  std::vector<uint8_t> counts;
  ScoreAtFirstSight(candidates, counts);
  const size_t count = candidates.size();
  size_t begin = std::min(count, static_cast<size_t>(request_.offset));
  size_t end = std::min(count, Needed());
  if (request_.ascending) std::tie(begin, end) = std::make_pair(count - end, count - begin);
  std::vector<Ranked> page;
  for (size_t block = begin / kCloseBlock * kCloseBlock; block < end; block += kCloseBlock) {
    std::vector<Ranked> ranked = RankBlock(candidates, counts, block, std::min(count, block + kCloseBlock));
    const size_t first = std::max(begin, block) - block;
    ranked.resize(std::min(ranked.size(), end - block), Ranked(0));
    page.insert(page.end(), std::make_move_iterator(ranked.begin() + static_cast<ptrdiff_t>(first)),
                std::make_move_iterator(ranked.end()));
  }
  if (request_.ascending) std::reverse(page.begin(), page.end());
  return page;
}

/// Few documents: their keys are fetched and sorted.
std::vector<Searcher::Ranked> Searcher::OrderFetched(const DocSet& documents) {
  std::vector<Ranked> ranked;
  const SortKey sort = request_.sort;
  Statement statement = reader_.database.Prepare("SELECT mtime, size, name FROM docs WHERE id = ?1");
  documents.ForEach([&](int64_t id) {
    if (statement.Bind(1, id).Step()) {
      const int column = sort == SortKey::kDate ? 0 : 1;
      const int64_t number = statement.IsNull(column) ? std::numeric_limits<int64_t>::min() : statement.Int(column);
      Ranked entry{id};
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
  const auto less = [](const Ranked& a, const Ranked& b) {
    if (a.number_key != b.number_key) return a.number_key < b.number_key;
    const int names = CompareNames(a.name_key, b.name_key);
    return names != 0 ? names < 0 : a.id < b.id;
  };
  const bool ascending = request_.ascending;
  std::sort(ranked.begin(), ranked.end(),
            [&](const Ranked& a, const Ranked& b) { return ascending ? less(a, b) : less(b, a); });
  return ranked;
}

/// Many documents: the column's index is walked until the page is full.
std::vector<Searcher::Ranked> Searcher::OrderByWalk(const DocSet& documents) {
  const char* column = request_.sort == SortKey::kDate ? "mtime" : request_.sort == SortKey::kSize ? "size" : "name";
  const std::string direction = request_.ascending ? " ASC" : " DESC";
  Statement statement = reader_.database.Prepare("SELECT id, " + std::string(column) + " FROM docs ORDER BY " + column +
                                                 direction + ", id" + direction);
  std::vector<Ranked> ranked;
  while (ranked.size() < Needed() && statement.Step()) {
    if (!documents.Contains(statement.Int(0))) continue;
    Ranked entry{statement.Int(0)};
    if (request_.sort == SortKey::kName) {
      entry.name_key = statement.Text(1);
    } else {
      entry.number_key = statement.IsNull(1) ? std::numeric_limits<int64_t>::min() : statement.Int(1);
    }
    ranked.push_back(std::move(entry));
  }
  return ranked;
}

std::vector<Searcher::Ranked> Searcher::OrderByColumn(const DocSet& documents, int64_t total) {
  std::vector<Ranked> ranked = total <= kFetchForOrderMax ? OrderFetched(documents) : OrderByWalk(documents);
  ranked.resize(std::min(ranked.size(), Needed()), Ranked(0));
  ranked.erase(ranked.begin(), ranked.begin() + std::min<ptrdiff_t>(request_.offset, std::ssize(ranked)));
  return ranked;
}

SearchHit Searcher::LoadHit(const Ranked& ranked) {
  SearchHit hit;
  hit.score = ranked.score;
  hit.number_key = ranked.number_key;
  hit.name_key = ranked.name_key;
  const std::optional<StoredDocument> stored = FindDocument(reader_.database, ranked.id);
  if (!stored.has_value()) return hit;
  hit.path = stored->row.path;
  hit.fields = UnpackDocument(stored->row, reader_.names, {});
  if (!request_.snippet || marked_.empty() || stored->text_bytes == 0) return hit;
  Statement body = reader_.database.Prepare("SELECT zstd FROM bodies WHERE id = ?1");
  if (body.Bind(1, ranked.id).Step()) {
    hit.snippet = MakeSnippet(reader_.codec.Unpack(body.Text(0)), marked_, request_.mark_start, request_.mark_end);
  }
  return hit;
}

SearchReply Searcher::Run() {
  const Totals totals = LoadTotals(reader_.database);
  documents_ = totals.documents;
  average_text_ = std::max(
      1.0, static_cast<double>(totals.text_bytes) / std::max<double>(1, static_cast<double>(totals.with_content)));
  const DocSet documents = Evaluate(*request_.query, true);
  SearchReply reply;
  reply.total = documents.Count();
  const std::vector<Ranked> page = request_.sort == SortKey::kRelevance
                                       ? RankByRelevance(documents, reply.total, reply.ranking_bounded)
                                       : OrderByColumn(documents, reply.total);
  for (const Ranked& ranked : page) reply.hits.push_back(LoadHit(ranked));
  if (reply.total == 0) reply.suggestions = Suggest();
  return reply;
}

}  // namespace ferrox::engine
