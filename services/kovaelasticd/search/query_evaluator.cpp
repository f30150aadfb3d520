#include "services/kovaelasticd/search/query_evaluator.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "fileindex/util.h"
#include "services/kovaelasticd/search/folder_words.h"
#include "services/kovaelasticd/search/path_condition.h"
#include "services/kovaelasticd/search/pattern_search.h"
#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/store_rows.h"
#include "services/kovaelasticd/store/work_limit.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

/// A condition is checked document by document when there are no more of them.
constexpr int64_t kCheckOneByOneMax = 2000;

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

/// A plain word that documents may lack, when it stands at the top of the query or is joined there with others by AND.
bool IsSoft(const QueryNode& node) { return node.type == QueryNode::Type::kText && !node.required; }

std::vector<const QueryNode*> SoftNodes(const QueryNode& query) {
  std::vector<const QueryNode*> soft;
  if (IsSoft(query)) soft.push_back(&query);
  if (query.type != QueryNode::Type::kAnd) return soft;
  for (const QueryNode& child : query.children) {
    if (IsSoft(child)) soft.push_back(&child);
  }
  return soft;
}

}  // namespace

FoundDocuments QueryEvaluator::Find(const QueryNode& query, bool all_words) {
  const std::vector<const QueryNode*> soft = SoftNodes(query);
  if (!soft.empty()) return FindSoftly(query, soft, all_words);
  FoundDocuments found;
  found.documents = Evaluate(query, true);
  return found;
}

/// What the strict part of the query finds, cut down to the documents with one of the soft words that count.
FoundDocuments QueryEvaluator::FindSoftly(const QueryNode& query, const std::vector<const QueryNode*>& soft,
                                          bool all_words) {
  FoundDocuments found;
  const bool has_strict = query.type == QueryNode::Type::kAnd && soft.size() < query.children.size();
  if (has_strict) found.documents = EvaluateAll(query, true, true);
  soft_.Find(soft, HasRareWord());
  for (const QueryNode* node : soft) NoteWords(*node);
  DocSet any = soft_.Any();
  if (has_strict && soft_.AnyCounts()) found.documents.IntersectWith(any);
  if (!has_strict) found.documents = std::move(any);
  if (soft.size() > 1 || !soft_.AnyCounts()) {
    found.with_all = found.documents;
    soft_.KeepAll(*found.with_all);
  }
  const int64_t total = found.documents.Count();
  const int64_t with_all = found.with_all.has_value() ? found.with_all->Count() : total;
  if (with_all == total) found.with_all.reset();
  if (all_words && with_all > 0) {
    if (found.with_all.has_value()) found.documents = *std::exchange(found.with_all, std::nullopt);
  } else {
    found.none_has_all = all_words && total > 0;
    found.ignored = soft_.Ignored();
  }
  found.repaired = soft_.Repaired();
  found.synonyms = soft_.UsedSynonyms();
  found.word_documents = soft_.WordDocuments();
  for (RankedWord& word : soft_.TakeRanked()) {
    for (const std::string& other : word.repairs) found_words_.marked.push_back({other, false});
    for (const std::string& other : word.related) {
      for (const std::string& part : SplitQueryText(other, false).words) found_words_.marked.push_back({part, false});
    }
    found_words_.ranked.push_back(std::move(word));
  }
  return found;
}

/// Whether one of the required words is.
bool QueryEvaluator::HasRareWord() const {
  return std::any_of(found_words_.ranked.begin(), found_words_.ranked.end(), [this](const RankedWord& word) {
    return word.documents > 0 && word.documents <= visible_.Documents() / constants_.common_part;
  });
}

DocSet QueryEvaluator::Evaluate(const QueryNode& node, bool ranking) {
  WorkLimit::Check();
  switch (node.type) {
    case QueryNode::Type::kAll:
      return visible_.All();
    case QueryNode::Type::kAnd:
      return EvaluateAll(node, ranking);
    case QueryNode::Type::kOr: {
      DocSet found;
      for (const QueryNode& child : node.children) found.UniteWith(Evaluate(child, ranking));
      return found;
    }
    case QueryNode::Type::kNot: {
      DocSet found = visible_.All();
      found.Subtract(Evaluate(node.children.front(), false));
      return found;
    }
    default:
      return IsWords(node.type) ? EvaluateWords(node, ranking) : EvaluateFilter(node);
  }
}

/// Words first, since they leave the fewest documents; then what AND and OR join; conditions on columns after that,
/// which few documents can be checked for one by one; and exclusions last. `without_soft` leaves the soft words out.
DocSet QueryEvaluator::EvaluateAll(const QueryNode& node, bool ranking, bool without_soft) {
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
    if (IsWords(child.type) && !(without_soft && IsSoft(child))) intersect(child);
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
  if (!any) found = visible_.All();
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

/// All documents for which a condition on a column holds, by an index of the table. Extensions are looked for with the
/// kind that has them and among folders, since their index is by kind first.
DocSet QueryEvaluator::EvaluateFilter(const QueryNode& node) {
  DocSet found;
  const auto collect = [&found](Statement& statement) {
    while (statement.Step()) found.Add(statement.Int(0));
    statement.Reset();
  };
  Database& database = database_;
  if (node.type == QueryNode::Type::kKind) {
    Statement statement = database.Prepare("SELECT id FROM docs WHERE kind = ?1");
    for (const int32_t kind : node.kinds) collect(statement.Bind(1, int64_t{kind}));
  } else if (node.type == QueryNode::Type::kExt) {
    Statement statement = database.Prepare("SELECT id FROM docs WHERE kind IN (?1, ?2) AND ext = ?3");
    statement.Bind(1, int64_t{KindOfExtension(node.text)}).Bind(2, int64_t{kFolder});
    collect(statement.Bind(3, std::string_view(node.text)));
  } else if (node.type == QueryNode::Type::kPath) {
    found = PathCondition(reader_, visible_.Version(), node.text).AllDocuments();
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
  visible_.Trim(found);
  return found;
}

/// Keeps the documents for which the condition holds (`wanted`) or does not. Few documents are checked one by one, by
/// their rows; for many, the set of all that match is cheaper. A range has no column: its words are in meta_fts.
void QueryEvaluator::ApplyFilter(DocSet& documents, const QueryNode& filter, bool wanted) {
  if (filter.type == QueryNode::Type::kPath) {
    return PathCondition(reader_, visible_.Version(), filter.text).Apply(documents, wanted);
  }
  if (documents.Count() > kCheckOneByOneMax || filter.type == QueryNode::Type::kRange) {
    const DocSet matching = EvaluateFilter(filter);
    wanted ? documents.IntersectWith(matching) : documents.Subtract(matching);
    return;
  }
  documents.RemoveIf([&](int64_t id) { return MatchesFilter(id, filter) != wanted; });
}

/// The same condition for one document, by its row.
bool QueryEvaluator::MatchesFilter(int64_t id, const QueryNode& filter) {
  Statement statement = database_.Prepare("SELECT kind, ext, size, mtime FROM docs WHERE id = ?1");
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
    default:
      return in_range(3);
  }
}

/// The documents with a word, phrase or beginning of a word; with `ranking` also its hits, and what snippets mark.
/// kText looks into the content, the name, the title and the searchable fields; kField into the named fields; kName
/// into names. A plain word is also looked for within names, by its groups of three characters; and in other forms and
/// in the names of folders above, unless it is behind a NOT.
DocSet QueryEvaluator::EvaluateWords(const QueryNode& node, bool ranking) {
  if (node.pattern) return EvaluatePattern(node, ranking);
  TermCollector found(database_, visible_, ranking ? hits_max_ : 0);
  const std::vector<WordForm> forms = FormsOf(node, ranking, constants_);
  found.Collect(forms);
  const bool in_names = node.type == QueryNode::Type::kName;
  if (in_names || (node.type == QueryNode::Type::kText && !node.phrase)) found.CollectNameParts(node.text);
  DocSet all = found.Set();
  if (ranking) {
    RankedWord& word = found_words_.ranked.emplace_back(RankedWord{FoldText(node.text)});
    word.letters = CountLetters(word.word);
    word.documents = found.Documents();
    word.rarity = Rarity(visible_.Documents(), word.documents);
    word.hits = found.TakeHits();
    word.phrases = PhrasesOf(forms);
    if (node.type == QueryNode::Type::kText && !node.phrase) {
      word.folders = DocumentsInFoldersNamed(reader_, visible_, SplitQueryText(node.text, node.prefix));
      word.folder_rarity = std::min(word.rarity, Rarity(visible_.Documents(), word.folders.Count()));
      all.UniteWith(word.folders);
    }
    NoteWords(node);
  }
  return all;
}

/// What matches in names, and for kText words of texts.
DocSet QueryEvaluator::EvaluatePattern(const QueryNode& node, bool ranking) {
  TermCollector found(database_, visible_, ranking ? hits_max_ : 0);
  const Pattern pattern(node.text);
  found.AddNamed(DocumentsNamedLike(reader_, visible_, pattern));
  if (node.type == QueryNode::Type::kText)
    CollectWordsLike(reader_, visible_, {pattern, node.text, ranking}, found, found_words_);
  if (ranking) {
    RankedWord& word = found_words_.ranked.emplace_back(RankedWord{pattern.Folded()});
    word.letters = CountLetters(word.word);
    word.documents = found.Documents();
    word.rarity = Rarity(visible_.Documents(), word.documents);
    word.hits = found.TakeHits();
  }
  return found.Set();
}

void QueryEvaluator::NoteWords(const QueryNode& node) {
  const QueryWords words = SplitQueryText(node.text, node.prefix);
  for (const std::string& word : words.words) {
    found_words_.marked.push_back({word, words.prefix && &word == &words.words.back()});
    found_words_.looked_for.push_back(word);
  }
}

}  // namespace ferrox::engine
