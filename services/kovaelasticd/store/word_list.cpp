#include "services/kovaelasticd/store/word_list.h"

#include <algorithm>

#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

constexpr size_t kLeastLetters = 4;

}  // namespace

bool WordList::Takes(std::string_view word) {
  if (word.size() < kLeastBytes || word.size() > kMostBytes) return false;
  const bool plain = std::none_of(word.begin(), word.end(), [](char c) {
    const auto byte = static_cast<unsigned char>(c);
    return byte < 0x80 && (byte < 'a' || byte > 'z');
  });
  if (!plain) return false;
  std::string folded;
  size_t letters = 0;
  for (size_t at = 0; at < word.size(); ++letters) {
    const CodePoint point = DecodeAt(word, at);
    if (point.value >= 0x80 && FoldTo(folded, point.value) != CharClass::kLetter) return false;
    at += point.length_bytes;
  }
  return letters >= kLeastLetters;
}

void WordList::Append(std::string_view word, bool in_several) {
  Group& group = groups_[word.size()];
  group.bytes.insert(group.bytes.end(), word.begin(), word.end());
  group.letters.push_back(LettersOf(word) | (in_several ? kInSeveral : 0));
}

WordList::Group WordList::Merged(const Group& a, const Group& b, size_t size) {
  Group merged;
  merged.bytes.reserve(a.bytes.size() + b.bytes.size());
  merged.letters.reserve(a.letters.size() + b.letters.size());
  const auto take = [&merged, size](const Group& from, size_t i, uint32_t more) {
    const std::string_view word = from.Word(i, size);
    merged.bytes.insert(merged.bytes.end(), word.begin(), word.end());
    merged.letters.push_back(from.letters[i] | more);
  };
  size_t i = 0, j = 0;
  while (i < a.letters.size() && j < b.letters.size()) {
    const int order = a.Word(i, size).compare(b.Word(j, size));
    if (order == 0) ++j;
    if (order <= 0) {
      take(a, i++, order == 0 ? kInSeveral : 0);
    } else {
      take(b, j++, 0);
    }
  }
  for (; i < a.letters.size(); ++i) take(a, i, 0);
  for (; j < b.letters.size(); ++j) take(b, j, 0);
  merged.bytes.shrink_to_fit();
  merged.letters.shrink_to_fit();
  return merged;
}

size_t WordList::Group::FirstFrom(std::string_view begin, size_t size) const {
  size_t first = 0;
  for (size_t end = letters.size(); first < end;) {
    const size_t middle = first + (end - first) / 2;
    if (Word(middle, size) < begin) {
      first = middle + 1;
    } else {
      end = middle;
    }
  }
  return first;
}

void WordList::Merge(const WordList& more) {
  for (size_t size = 0; size < groups_.size(); ++size) {
    if (!more.groups_[size].letters.empty()) groups_[size] = Merged(groups_[size], more.groups_[size], size);
  }
}

size_t WordList::Count() const {
  size_t count = 0;
  for (const Group& group : groups_) count += group.letters.size();
  return count;
}

}  // namespace ferrox::engine
