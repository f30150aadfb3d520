// What SoftWords finds beside a word that is not the word itself: its synonyms, and compounds of which it is a part.
#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "services/kovaelasticd/search/compound_words.h"
#include "services/kovaelasticd/search/soft_words.h"
#include "services/kovaelasticd/search/synonym_words.h"
#include "services/kovaelasticd/search/visible_count.h"
#include "services/kovaelasticd/store/word_list.h"
#include "services/kovaelasticd/store/work_limit.h"

namespace ferrox::engine {

namespace {

/// A word that more documents have finds enough without what it is a part of, and so does one that is.
constexpr int64_t kCompoundedDocumentsMax = 50;
constexpr size_t kCompoundsTakenMax = 24;
/// So many documents may have another word that a word finds, too, however few there are in all.
constexpr int64_t kNeverCommon = 50;

}  // namespace

void SoftWords::FindSynonyms(const std::vector<const QueryNode*>& nodes) {
  if (request_.synonyms == nullptr || request_.synonyms->IsEmpty()) return;
  std::vector<std::string> singles;
  singles.reserve(nodes.size());
  for (const QueryNode* node : nodes) singles.push_back(SingleWord(*node));
  const std::vector<SynonymOfWord> synonyms = SynonymsIn(singles, *request_.synonyms);
  for (Word& word : words_) {
    if (word.is_ignored) continue;
    const bool has_own = word.found->Documents() > 0;
    for (const SynonymOfWord& synonym : synonyms) {
      if (singles[synonym.of] != SingleWord(*word.node)) continue;
      if (!TakeRelated(word, synonym.shown, FormsOf(synonym.words, constants_), constants_.synonym)) continue;
      word.synonyms = word.related.size();
      used_synonyms_.push_back({synonym.from, synonym.shown, has_own});
    }
  }
}

/// Whether the query may be in a language of compounds: one of the documents that its rare words find is, or these find
/// none. So queries in other languages cost next to nothing, and find no chance neighbours ("carpet" for "car").
bool SoftWords::MayHaveCompounds() {
  bool is_any_found = false;
  for (const Word& word : words_) {
    const int64_t documents = word.is_ignored ? 0 : word.found->Documents();
    if (documents == 0 || documents > kCompoundedDocumentsMax) continue;
    is_any_found = true;
    if (CountCompounding(reader_.database, word.found->Set()) > 0) return true;
  }
  return !is_any_found;
}

void SoftWords::FindCompounds() {
  const auto is_wanted = [](const Word& word) {
    return !word.is_ignored && word.found->Documents() <= kCompoundedDocumentsMax &&
           WordList::Takes(SingleWord(*word.node));
  };
  if (std::none_of(words_.begin(), words_.end(), is_wanted) || !MayHaveCompounds()) return;
  const std::shared_ptr<const WordList> known = reader_.words.Load(reader_.database, visible_.Version());
  if (known == nullptr) return;
  for (Word& word : words_) {
    if (is_wanted(word)) TakeCompounds(word, *known);
  }
}

/// The list has words of other users' documents, too: what counts is that visible ones have the compound, mostly in
/// such a language, and its other part.
void SoftWords::TakeCompounds(Word& word, const WordList& known) {
  const size_t most = word.related.size() + kCompoundsTakenMax;
  for (const Compound& compound : CompoundsIn(known, SingleWord(*word.node))) {
    if (word.related.size() == most) return;
    if (!word.related.empty() && word.related.back() == compound.word) continue;
    WorkLimit::Check();
    const std::vector<WordForm> forms = FormsOf(compound.word, constants_);
    TermCollector found(reader_.database, visible_, 0);
    found.StopAfter(kCompoundedDocumentsMax);
    found.Collect(forms);
    if (found.HasStopped() || found.Documents() == 0) continue;
    if (2 * CountCompounding(reader_.database, found.Set()) < found.Documents()) continue;
    const auto is_visible = [this](const std::string& other) {
      return AnyVisible(reader_.database, visible_, FormsOf(other, constants_).front());
    };
    if (std::none_of(compound.others.begin(), compound.others.end(), is_visible)) continue;
    (void)TakeRelated(word, compound.word, forms, constants_.compound);
  }
}

/// Adds what is found of another word by a share of its worth. False where that is nothing, or so much that the word
/// would not be rare any more.
bool SoftWords::TakeRelated(Word& word, const std::string& shown, const std::vector<WordForm>& forms, double share) {
  WorkLimit::Check();
  TermCollector found(reader_.database, visible_, hits_max_);
  found.StopAfter(word.is_common ? WalkedMax() : std::max(kNeverCommon, CommonMax()));
  found.Collect(forms);
  if (found.HasStopped() || found.Documents() == 0) return false;
  word.related.push_back(shown);
  word.found->AddRelated(found, share, static_cast<uint8_t>(word.related.size()), constants_);
  word.forms.insert(word.forms.end(), forms.begin(), forms.end());
  return true;
}

}  // namespace ferrox::engine
