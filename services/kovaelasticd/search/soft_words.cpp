#include "services/kovaelasticd/search/soft_words.h"

#include <algorithm>
#include <numeric>
#include <set>
#include <utility>

#include "services/kovaelasticd/search/folder_words.h"
#include "services/kovaelasticd/search/repair.h"
#include "services/kovaelasticd/store/work_limit.h"
#include "services/kovaelasticd/text/function_words.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

/// A word in no more documents than that may be a misspelling.
constexpr int64_t kRepairedDocumentsMax = 2;
/// Of a common word, so many documents are asked for one by one; for more, walking through all that have it costs less.
constexpr int64_t kAskOneByOneMax = 100;

}  // namespace

SoftWords::Word SoftWords::MakeWord(const Wanted& wanted) const {
  Word word = {wanted.node, wanted.group, FoldText(wanted.node->text), FormsOf(*wanted.node, true, constants_),
               std::make_unique<TermCollector>(reader_.database, visible_, hits_max_)};
  word.is_function = wanted.is_function;
  if (word.is_function) word.forms.resize(1);  // its stem tells nothing
  if (wanted.group != nullptr) {
    for (WordForm& form : CodeForms(wanted.group->joined, constants_)) word.forms.push_back(std::move(form));
  }
  return word;
}

/// Each word once.
std::vector<SoftWords::Wanted> SoftWords::Distinct(const std::vector<const QueryNode*>& nodes) {
  std::vector<Wanted> distinct;
  std::set<std::pair<std::string, bool>> seen;
  const QueryNode* group = nullptr;
  size_t left = 0;  // of the group
  for (const QueryNode* node : nodes) {
    if (node->joined_words > 0) {
      group = node;
      left = node->joined_words;
    }
    const bool is_new = seen.insert({FoldText(node->text), node->prefix}).second;
    if (is_new) distinct.push_back({node, left > 0 ? group : nullptr});
    if (left > 0) --left;
  }
  return distinct;
}

/// Which of too many words count: those in the fewest documents, as they are written. Each round counts the documents
/// of words further than the last one, until enough words are counted to their end.
std::vector<bool> SoftWords::Rarest(const std::vector<Wanted>& wanted) {
  std::vector<bool> counts(wanted.size(), true);
  if (wanted.size() <= constants_.words_max) return counts;
  std::vector<int64_t> documents(wanted.size(), -1);
  size_t known = 0;
  for (int64_t most = CommonMax() / 64 + 1; known < constants_.words_max; most *= 4) {
    for (size_t i = 0; i < wanted.size(); ++i) {
      if (documents[i] >= 0) continue;
      WorkLimit::Check();
      TermCollector counted(reader_.database, visible_, 0);
      counted.StopAfter(most);
      counted.Collect(FormsOf(*wanted[i].node, false, constants_));
      if (counted.HasStopped()) continue;
      documents[i] = counted.Documents();
      ++known;
    }
    if (IsCommon(most)) break;
  }
  std::vector<size_t> order(wanted.size());
  std::iota(order.begin(), order.end(), size_t{0});
  const auto rarer = [&](size_t a, size_t b) {
    return documents[b] < 0 ? documents[a] >= 0 : documents[a] >= 0 && documents[a] < documents[b];
  };
  std::stable_sort(order.begin(), order.end(), rarer);
  for (size_t i = constants_.words_max; i < order.size(); ++i) counts[order[i]] = false;
  return counts;
}

/// A part in quotation marks is none.
void SoftWords::MarkFunctionWords(std::vector<Wanted>& wanted) {
  std::vector<std::string> words;
  words.reserve(wanted.size());
  for (const Wanted& one : wanted) words.push_back(SingleWord(*one.node));
  const std::vector<bool> are = FindFunctionWords(words);
  for (size_t i = 0; i < wanted.size(); ++i) wanted[i].is_function = are[i];
}

void SoftWords::Find(const std::vector<const QueryNode*>& nodes, bool rare_beside) {
  std::vector<Wanted> distinct = Distinct(nodes);
  MarkFunctionWords(distinct);
  const std::vector<bool> counts = Rarest(distinct);
  for (size_t i = 0; i < distinct.size(); ++i) {
    WorkLimit::Check();
    Word& word = words_.emplace_back(MakeWord(distinct[i]));
    word.is_ignored = !counts[i];
    if (word.is_ignored) continue;
    word.found->StopAfter(WalkedMax());
    word.found->Collect(word.forms);
    if (!word.found->HasStopped()) FindSpellings(word);
    word.is_ignored = word.found->HasStopped();
    word.is_common = !word.is_ignored && (word.is_function || IsCommon(word.found->Documents()));
  }
  FindSynonyms(nodes);
  FindCompounds();
  LookForRepairs();
  const auto is_rare = [](const Word& word) {
    return !word.is_ignored && !word.is_common && word.found->Documents() > 0;
  };
  if (!rare_beside && std::none_of(words_.begin(), words_.end(), is_rare)) {
    for (size_t i = 0; i < words_.size(); ++i) {
      words_[i].is_common = words_[i].is_function = distinct[i].is_function = false;
      if (!words_[i].is_ignored || !counts[i]) continue;
      words_[i] = MakeWord(distinct[i]);
      words_[i].found->Collect(words_[i].forms);
    }
  }
  for (Word& word : words_) {
    if (!word.is_ignored) FindElsewhere(word);
  }
}

/// "ue" is likely to stand for an umlaut. That a vowel has lost its dots is a guess, for words that are hardly found.
void SoftWords::FindSpellings(Word& word) const {
  const std::string single = SingleWord(*word.node);
  const bool has_pair =
      single.find("ae") != single.npos || single.find("oe") != single.npos || single.find("ue") != single.npos;
  // Articles are written as a part of the word: UTF-8 of Hebrew begins with D7, of Arabic with D8 to DB.
  const bool has_article = !single.empty() && single[0] >= '\xD7' && single[0] <= '\xDB';
  if (!has_pair && !has_article && word.found->Documents() > kRepairedDocumentsMax) return;
  const std::vector<WordForm> spellings = SpellingForms(single, constants_);
  word.found->Collect(spellings);
  word.forms.insert(word.forms.end(), spellings.begin(), spellings.end());
}

void SoftWords::LookForRepairs() {
  std::vector<RareWord> rare;
  std::vector<size_t> places;
  for (size_t i = 0; i < words_.size(); ++i) {
    Word& word = words_[i];
    std::string single = SingleWord(*word.node);
    if (single.empty()) continue;
    const auto elsewhere = request_.elsewhere.find(word.text);
    word.elsewhere = elsewhere == request_.elsewhere.end() ? 0 : elsewhere->second;
    const int64_t own = word.is_ignored ? kRepairedDocumentsMax + 1 : word.found->Documents();
    word_documents_[word.text] = own;
    const int64_t documents = own + word.elsewhere;
    if (documents > kRepairedDocumentsMax) continue;
    rare.push_back({std::move(single), documents});
    places.push_back(i);
  }
  if (rare.empty()) return;
  for (const Repair& repair : RepairWords(reader_, visible_, rare)) {
    TakeRepair(words_[places[repair.of]], repair.word, repair.likelihood);
  }
}

/// Adds what is found of the other word.
void SoftWords::TakeRepair(Word& word, const std::string& other, double likelihood) {
  WorkLimit::Check();
  const bool has_own = word.own_first || (word.repairs.empty() && word.found->Documents() + word.elsewhere > 0);
  TermCollector found(reader_.database, visible_, hits_max_);
  const std::vector<WordForm> forms = FormsOf(other, constants_);
  found.Collect(forms);
  if (found.Documents() == 0) return;
  word.found->AddRepaired(found, likelihood, constants_);
  word.own_first = has_own;
  word.repairs.push_back(other);
  word.forms.insert(word.forms.end(), forms.begin(), forms.end());
  repaired_.push_back({word.text, other, has_own});
}

/// What finds a word beside its places: parts of names, and folders.
void SoftWords::FindElsewhere(Word& word) {
  if (!word.node->phrase) word.found->CollectNameParts(word.node->text);
  word.folders = DocumentsInFoldersNamed(reader_, visible_, SplitQueryText(word.node->text, word.node->prefix));
}

bool SoftWords::AnyCounts() const {
  return std::any_of(words_.begin(), words_.end(),
                     [](const Word& word) { return !word.is_ignored && !word.is_common; });
}

DocSet SoftWords::Any() const {
  DocSet any;
  for (const Word& word : words_) {
    if (word.is_ignored || word.is_common) continue;
    any.UniteWith(word.found->Set());
    any.UniteWith(word.folders);
  }
  return any;
}

bool SoftWords::Has(int64_t id, const Word& word) {
  return std::any_of(word.forms.begin(), word.forms.end(), [&](const WordForm& form) {
    return HasExpression(reader_.database, "content_fts", form.content, id) ||
           HasExpression(reader_.database, "meta_fts", form.meta, id);
  });
}

/// A word that was not walked through to its end.
void SoftWords::KeepIgnored(DocSet& documents, const Word& word) {
  Word all = MakeWord({word.node, word.group, word.is_function});
  FindElsewhere(all);
  if (documents.Count() <= kAskOneByOneMax) {
    DocSet found = all.found->Set();
    found.UniteWith(all.folders);
    documents.RemoveIf([&](int64_t id) { return !found.Contains(id) && !Has(id, word); });
    return;
  }
  all.found->Collect(all.forms);
  DocSet found = all.found->Set();
  found.UniteWith(all.folders);
  documents.IntersectWith(found);
}

void SoftWords::KeepAll(DocSet& documents) {
  for (const Word& word : words_) {
    if (word.is_ignored) continue;
    DocSet found = word.found->Set();
    found.UniteWith(word.folders);
    documents.IntersectWith(found);
  }
  for (const Word& word : words_) {
    if (documents.Count() == 0) return;
    WorkLimit::Check();
    if (word.is_ignored) KeepIgnored(documents, word);
  }
}

std::vector<std::string> SoftWords::Ignored() const {
  std::vector<std::string> ignored;
  for (const Word& word : words_) {
    if (word.is_ignored || word.is_common) ignored.push_back(word.text);
  }
  return ignored;
}

std::vector<RankedWord> SoftWords::TakeRanked() {
  std::vector<RankedWord> ranked;
  for (Word& word : words_) {
    if (word.is_ignored) continue;
    RankedWord& taken = ranked.emplace_back(RankedWord{word.text});
    taken.letters = CountLetters(word.text);
    taken.documents = word.found->Documents();
    taken.rarity = Rarity(visible_.Documents(), taken.documents);
    taken.hits = word.found->TakeHits();
    taken.folder_rarity = std::min(taken.rarity, Rarity(visible_.Documents(), word.folders.Count()));
    taken.folders = std::move(word.folders);
    taken.is_function = word.is_function;
    taken.own_first = word.own_first;
    taken.repairs = std::move(word.repairs);
    taken.related = std::move(word.related);
    taken.synonyms = word.synonyms;
    taken.phrases = PhrasesOf(word.forms);
  }
  return ranked;
}

}  // namespace ferrox::engine
