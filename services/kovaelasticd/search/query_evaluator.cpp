#include "services/kovaelasticd/search/query_evaluator.h"

#include <algorithm>
#include <cmath>
#include <string_view>

#include "fileindex/util.h"
#include "services/kovaelasticd/search/path_condition.h"
#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/store_rows.h"
#include "services/kovaelasticd/store/work_limit.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

/// A condition is checked document by document when there are no more of them.
constexpr int64_t kCheckOneByOneMax = 2000;
/// Of a word that is looked for within names, the first so many groups of three characters are compared.
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

/// The expression for a part of a name; "" for fewer than three characters.
std::string GramExpression(const std::string& text) {
  const std::vector<std::string> grams = Trigrams(text, kGramsMax);
  return grams.empty() ? std::string() : "{grams} : " + PhraseExpression(grams, false);
}

/// Joins full-text expressions, of which either may be "".
void AppendOr(std::string& expression, const std::string& alternative) {
  if (alternative.empty()) return;
  if (!expression.empty()) expression += " OR ";
  expression += "(" + alternative + ")";
}

}  // namespace

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
/// which few documents can be checked for one by one; and exclusions last.
DocSet QueryEvaluator::EvaluateAll(const QueryNode& node, bool ranking) {
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

/// Runs the full-text expressions for a word, phrase or beginning of a word. kText looks into the content, the name,
/// the title and the searchable fields; kField into the named fields, whose words are stored with the field's name
/// before them; kName into names. A plain word is also looked for within names, by its groups of three characters.
void QueryEvaluator::CollectWords(const QueryNode& node, HitCollector& content, HitCollector& meta) {
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
      if (name == field::kTitle) {  // and the title that the text has
        AppendOr(meta_expression, "{title} : " + phrase);
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
  if (in_content) Collect(database_, "content_fts", phrase, words.prefix, content);
  if (!meta_expression.empty()) Collect(database_, "meta_fts", meta_expression, words.prefix, meta);
}

/// The documents with these words; with `ranking` also their hits, what they weigh, and what snippets mark.
DocSet QueryEvaluator::EvaluateWords(const QueryNode& node, bool ranking) {
  HitCollector content(hits_max_, visible_);
  HitCollector meta(hits_max_, visible_);
  CollectWords(node, content, meta);
  DocSet found = content.TakeSet();
  found.UniteWith(meta.Set());
  if (ranking) {
    RankedWord term;
    term.weight = std::log(1.0 + static_cast<double>(visible_.Documents()) / static_cast<double>(1 + found.Count()));
    term.content = content.TakeHits();
    term.meta = meta.TakeHits();
    found_words_.ranked.push_back(std::move(term));
    const QueryWords words = SplitQueryText(node.text, node.prefix);
    for (const std::string& word : words.words) {
      found_words_.marked.push_back({word, words.prefix && &word == &words.words.back()});
      found_words_.looked_for.push_back(word);
    }
  }
  return found;
}

}  // namespace ferrox::engine
