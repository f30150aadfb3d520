#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

namespace ferrox::engine {

/// Words in memory, for finding those that are much like another one. They lie by their size, without a gap, each with
/// a set of its letters, so that looking through all of them costs some 2 ns a word: 230,000 words, which is what
/// 22,000 manuals and guides have, take 3 MB and half a millisecond.
class WordList {
 public:
  static constexpr size_t kLeastBytes = 4;
  static constexpr size_t kMostBytes = 48;

  /// Whether a word of the index belongs here: of four letters or more and nothing but letters; no stem, no group of
  /// characters, no word of a field.
  static bool Takes(std::string_view word);

  /// Appends a word that comes after all others of its size, by bytes. `in_several`: documents, perhaps.
  void Append(std::string_view word, bool in_several);
  /// A word that both have is taken to be in several documents.
  void Merge(const WordList& more);
  size_t Count() const;

  /// Calls `visit(word, in_several)` for each word of `least` to `most` bytes that has at most `changes` other letters
  /// than `word`, and lacks at most so many of its; for a letter that is no ASCII, its bytes count. A word within as
  /// many errors is among them.
  template <typename Visitor>
  void ForEachLike(std::string_view word, size_t least, size_t most, int changes, Visitor&& visit) const {
    const uint32_t letters = LettersOf(word);
    for (size_t bytes = least; bytes <= most && bytes <= kMostBytes; ++bytes) {
      const Group& group = groups_[bytes];
      for (size_t i = 0; i < group.letters.size(); ++i) {
        const uint32_t entry = group.letters[i];
        if (!HasAtMost(entry & ~letters & ~kInSeveral, changes) || !HasAtMost(letters & ~entry, changes)) continue;
        visit(group.Word(i, bytes), (entry & kInSeveral) != 0);
      }
    }
  }

  bool Has(std::string_view word) const {
    if (word.size() > kMostBytes) return false;
    const Group& group = groups_[word.size()];
    const size_t at = group.FirstFrom(word, word.size());
    return at < group.letters.size() && group.Word(at, word.size()) == word;
  }

  /// Calls `visit(word)` for each longer word that has all letters of `word`: those that contain it are among them.
  template <typename Visitor>
  void ForEachWith(std::string_view word, Visitor&& visit) const {
    const uint32_t letters = LettersOf(word);
    for (size_t bytes = word.size() + 1; bytes <= kMostBytes; ++bytes) {
      const Group& group = groups_[bytes];
      for (size_t i = 0; i < group.letters.size(); ++i) {
        if ((letters & ~group.letters[i]) == 0) visit(group.Word(i, bytes));
      }
    }
  }

  /// Calls `visit(word, in_several)` for each word that begins with `begin`, those of one size in the order of bytes.
  template <typename Visitor>
  void ForEachBeginning(std::string_view begin, Visitor&& visit) const {
    for (size_t bytes = begin.size(); bytes <= kMostBytes; ++bytes) {
      const Group& group = groups_[bytes];
      for (size_t i = group.FirstFrom(begin, bytes); i < group.letters.size(); ++i) {
        if (!group.Word(i, bytes).starts_with(begin)) break;
        visit(group.Word(i, bytes), (group.letters[i] & kInSeveral) != 0);
      }
    }
  }

 private:
  static constexpr uint32_t kInSeveral = 1;  ///< a bit that no letter has

  /// Words of one size, in the order of their bytes.
  struct Group {
    std::vector<char> bytes;
    std::vector<uint32_t> letters;
    std::string_view Word(size_t i, size_t size) const { return {bytes.data() + i * size, size}; }
    size_t FirstFrom(std::string_view begin, size_t size) const;
  };

  /// A bit for each letter of ASCII; other bytes share these.
  static uint32_t LettersOf(std::string_view word) {
    uint32_t letters = 0;
    for (const char c : word) letters |= uint32_t{1} << (static_cast<unsigned char>(c) & 31);
    return (letters & kInSeveral) == 0 ? letters : (letters & ~kInSeveral) | uint32_t{1} << 31;
  }
  static bool HasAtMost(uint32_t bits, int count) {
    for (; bits != 0 && count > 0; --count) bits &= bits - 1;
    return bits == 0;
  }
  static Group Merged(const Group& a, const Group& b, size_t size);

  std::array<Group, kMostBytes + 1> groups_;  ///< by size
};

}  // namespace ferrox::engine
