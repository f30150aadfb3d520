#include "services/kovaelasticd/search/word_forms.h"

#include <algorithm>
#include <utility>

#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/text/codes.h"
#include "services/kovaelasticd/text/spellings.h"
#include "services/kovaelasticd/text/stems.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

/// Of a word that is looked for within names, the first so many groups of three characters are compared.
constexpr size_t kGramsMax = 32;
constexpr char kPlainColumns[] = "{name title text} : ";

WordForm TextForm(WordForm::Kind kind, const std::string& phrase, bool prefix, double share) {
  return {kind, phrase, kPlainColumns + phrase, prefix, share};
}

/// A word in fields, whose words are stored with the field's name before them.
WordForm FieldForm(const QueryNode& node, const QueryWords& words) {
  WordForm form;
  form.prefix = words.prefix;
  for (const std::string& name : node.fields) {
    if (name == field::kTextContent) {
      form.content = PhraseExpression(words.words, words.prefix);
      continue;
    }
    if (!form.meta.empty()) form.meta += " OR ";
    if (name == field::kTitle) {  // and the title that the text has
      form.meta += "({title} : " + PhraseExpression(words.words, words.prefix) + ")";
      continue;
    }
    std::vector<std::string> marked = words.words;
    for (std::string& word : marked) word.insert(0, name + kFieldEnd);
    form.meta += "({fields} : " + PhraseExpression(marked, words.prefix) + ")";
  }
  return form;
}

/// The marked stems, and those unmarked, which words that are their own stem have alone: together one form. But where
/// the word is its own stem, the mark is at other forms of it only: what it finds comes beside the word itself.
void AddStems(std::vector<WordForm>& forms, const std::string& word, double share) {
  std::string any;
  for (const std::string& stem : QueryStems(word)) {
    if (stem.substr(1) == word) {
      forms.push_back(TextForm(WordForm::Kind::kOther, PhraseExpression({stem}, false), false, share));
      continue;
    }
    for (const std::string& form : {stem, stem.substr(1)}) {
      if (form.empty()) continue;
      any += (any.empty() ? "" : " OR ") + PhraseExpression({form}, false);
    }
  }
  if (!any.empty()) forms.push_back(TextForm(WordForm::Kind::kStem, "(" + any + ")", false, share));
}

std::vector<WordForm> OtherForms(const std::vector<std::string>& words, const RankingConstants& constants) {
  std::vector<WordForm> forms;
  forms.reserve(words.size());
  for (const std::string& word : words) {
    forms.push_back(TextForm(WordForm::Kind::kOther, PhraseExpression({word}, false), false, constants.spelling));
  }
  return forms;
}

}  // namespace

std::string SingleWord(const QueryNode& node) {
  QueryWords words = SplitQueryText(node.text, node.prefix);
  return words.words.size() == 1 && !words.prefix && !node.phrase ? std::move(words.words.front()) : std::string();
}

std::vector<WordForm> FormsOf(const QueryNode& node, bool widely, const RankingConstants& constants) {
  const QueryWords words = SplitQueryText(node.text, node.prefix);
  if (node.type == QueryNode::Type::kField) return {FieldForm(node, words)};
  const std::string phrase = PhraseExpression(words.words, words.prefix);
  if (node.type == QueryNode::Type::kName) {
    return {{WordForm::Kind::kExact, "", "{name} : " + phrase, words.prefix, 1}};
  }
  std::vector<WordForm> forms = {TextForm(WordForm::Kind::kExact, phrase, words.prefix, 1)};
  if (!widely || node.phrase || words.prefix) return forms;
  if (words.words.size() == 1) AddStems(forms, words.words.front(), constants.stem);
  for (WordForm& code : CodeForms(node.text, constants)) {
    if (code.content != phrase) forms.push_back(std::move(code));
  }
  return forms;
}

std::vector<WordForm> CodeForms(const std::string& text, const RankingConstants& constants) {
  return OtherForms(JoinedCodes(text), constants);
}

std::vector<WordForm> SpellingForms(const std::string& word, const RankingConstants& constants) {
  return OtherForms(OtherSpellings(word), constants);
}

std::vector<WordForm> FormsOf(const std::string& word, const RankingConstants& constants) {
  std::vector<WordForm> forms = {TextForm(WordForm::Kind::kExact, PhraseExpression({word}, false), false, 1)};
  AddStems(forms, word, constants.stem);
  return forms;
}

WordForm FormOfAny(const std::vector<std::string>& words) {
  std::string any;
  for (const std::string& word : words) any += (any.empty() ? "" : " OR ") + PhraseExpression({word}, false);
  return TextForm(WordForm::Kind::kExact, "(" + any + ")", false, 1);
}

std::vector<WordForm> FormsOf(const std::vector<std::string>& words, const RankingConstants& constants) {
  if (words.size() == 1) return FormsOf(words.front(), constants);
  return {TextForm(WordForm::Kind::kExact, PhraseExpression(words, false), false, 1)};
}

std::vector<std::string> PhrasesOf(const std::vector<WordForm>& forms) {
  std::vector<std::string> phrases;
  for (const WordForm& form : forms) {
    if (!form.prefix && !form.content.empty()) phrases.push_back(form.content);
  }
  return phrases;
}

std::string NamePartExpression(const std::string& text) {
  const std::vector<std::string> grams = Trigrams(text, kGramsMax);
  return grams.empty() ? std::string() : "{grams} : " + PhraseExpression(grams, false);
}

}  // namespace ferrox::engine
