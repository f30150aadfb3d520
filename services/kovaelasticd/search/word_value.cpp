#include "services/kovaelasticd/search/word_value.h"

#include <algorithm>
#include <string>

namespace ferrox::engine {

double WordValue::Places(uint8_t places, const DocumentShape& shape) const {
  double value = 0;
  if ((places & kInName) != 0) value += c_.in_name + shape.of_name * shape.of_name * shape.of_name * c_.in_most_of_name;
  if ((places & kInName) != 0 && shape.is_name) value += c_.in_whole_name;
  if ((places & (kInName | kInNamePart)) == kInNamePart) value += c_.in_name_part;
  if ((places & kInTitle) != 0) value += c_.in_title;
  if ((places & kInText) != 0) value += c_.in_fields;
  return value;
}

/// The term of BM25.
double WordValue::Text(const RankedWord& word, const TermHit& hit, double length) const {
  const double count = Occurrences(hit, c_);
  return (word.is_function ? c_.function_word : 1) * count * (c_.k1 + 1) / (count + c_.k1 * length);
}

double WordValue::Of(const RankedWord& word, const TermHit& hit, const DocumentShape& shape) const {
  double value = Text(word, hit, shape.length) + Places(hit.places, shape);
  const auto other_places = static_cast<uint8_t>(hit.other_places & ~hit.places);
  if (other_places != 0) value += OtherShare(hit) * Places(other_places, shape);
  if (hit.related > word.synonyms) value = std::min(value, c_.compound_most);
  if (word.own_first) value = hit.repaired ? std::min(value, c_.repaired_most) : value + c_.own_word;
  return word.rarity * value;
}

void WordValue::Explain(const RankedWord& word, const TermHit& hit, const DocumentShape& shape,
                        std::vector<ScorePart>& parts) const {
  const bool is_related = hit.related > 0 && hit.related <= word.related.size();
  const std::string& what = is_related                              ? word.related[hit.related - 1U]
                            : hit.repaired && !word.repairs.empty() ? word.repairs.front()
                                                                    : word.word;
  double left = Of(word, hit, shape);
  const auto add = [&](const char* where, double value) {
    value = std::min(value, left);
    if (value > 0) parts.push_back({what, where, value});
    left -= value;
  };
  const auto place = [&](uint8_t bits) {
    return word.rarity *
           (Places(hit.places & bits, shape) + OtherShare(hit) * Places(hit.other_places & ~hit.places & bits, shape));
  };
  add("title", place(kInTitle));
  add("name", place(kInName | kInNamePart));
  add("fields", place(kInText));
  add("text", word.rarity * Text(word, hit, shape.length));
  add("as typed", left);
}

}  // namespace ferrox::engine
