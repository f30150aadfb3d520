#include "services/kovaelasticd/text/words.h"

#include <algorithm>
#include <cstddef>

namespace ferrox::engine {

namespace {

/// What a byte is worth: the folded form of an ASCII letter or digit, or one of these.
constexpr unsigned char kSeparatorByte = 0;
constexpr unsigned char kWideByte = 1;  ///< part of a character of several bytes
constexpr std::array<unsigned char, 256> kByteFold = [] {
  std::array<unsigned char, 256> table{};
  for (size_t c = 0x80; c < 0x100; ++c) table[c] = kWideByte;
  for (unsigned char c = '0'; c <= '9'; ++c) table[c] = c;
  for (unsigned char c = 'a'; c <= 'z'; ++c) {
    table[c] = c;
    table[static_cast<size_t>(c - 'a' + 'A')] = c;
  }
  return table;
}();

unsigned char FoldByte(char byte) { return kByteFold[static_cast<unsigned char>(byte)]; }

}  // namespace

bool WordScanner::Emit(Kind kind, size_t begin, size_t end) {
  kind_ = kind;
  begin_ = begin;
  end_ = end;
  return true;
}

/// Adds to the word, as long as it does not become too long.
void WordScanner::Append(std::string_view folded) {
  if (word_size_ + folded.size() > kWordMaxBytes) return;
  std::copy(folded.begin(), folded.end(), word_.begin() + static_cast<ptrdiff_t>(word_size_));
  word_size_ += folded.size();
}

bool WordScanner::Next() {
  word_size_ = 0;
  while (pos_ < text_.size()) {
    if (previous_.empty()) {
      while (pos_ < text_.size() && FoldByte(text_[pos_]) == kSeparatorByte) ++pos_;
      if (pos_ >= text_.size()) return false;
      if (FoldByte(text_[pos_]) != kWideByte) return NextPlainWord();
    }
    const CodePoint c = DecodeAt(text_, pos_);
    piece_.clear();
    const CharClass char_class = FoldTo(piece_, c.value);
    if (char_class == CharClass::kPaired) {
      if (NextPair(c)) return true;
      continue;
    }
    if (char_class == CharClass::kMark) {
      pos_ += c.length_bytes;
      continue;
    }
    if (!previous_.empty()) break;
    if (char_class == CharClass::kLetter) return NextPlainWord();
    pos_ += c.length_bytes;
  }
  if (previous_.empty()) return false;
  Append(previous_);
  previous_.clear();
  return Emit(Kind::kRunEnd, previous_begin_, previous_end_);
}

/// Takes a paired character; true when it completes a pair.
bool WordScanner::NextPair(const CodePoint& c) {
  const size_t begin = pos_;
  pos_ += c.length_bytes;
  const bool complete = !previous_.empty();
  if (complete) {
    Append(previous_);
    Append(piece_);
    (void)Emit(Kind::kPair, previous_begin_, pos_);
  }
  previous_ = piece_;
  previous_begin_ = begin;
  previous_end_ = pos_;
  return complete;
}

/// A run of letters and digits, with accents on their own skipped. ASCII, which most text is, takes the inner loop.
bool WordScanner::NextPlainWord() {
  const size_t begin = pos_;
  size_t end = pos_;
  for (;;) {
    unsigned char folded = kSeparatorByte;
    while (pos_ < text_.size() && (folded = FoldByte(text_[pos_])) > kWideByte) {
      if (word_size_ < kWordMaxBytes) word_[word_size_++] = static_cast<char>(folded);
      end = ++pos_;
    }
    if (pos_ >= text_.size() || folded == kSeparatorByte) break;
    const CodePoint c = DecodeAt(text_, pos_);
    piece_.clear();
    const CharClass char_class = FoldTo(piece_, c.value);
    if (char_class == CharClass::kSeparator || char_class == CharClass::kPaired) break;
    Append(piece_);
    pos_ += c.length_bytes;
    end = pos_;
  }
  return Emit(Kind::kWord, begin, end);
}

QueryWords SplitQueryText(std::string_view text, bool prefix) {
  QueryWords result;
  result.prefix = prefix;
  WordScanner scanner(text);
  WordScanner::Kind before = WordScanner::Kind::kWord;
  WordScanner::Kind last = WordScanner::Kind::kWord;
  while (scanner.Next()) {
    before = last;
    last = scanner.WordKind();
    result.words.emplace_back(scanner.Word());
  }
  if (last != WordScanner::Kind::kRunEnd) return result;
  // Where the run goes on in a document, its last character is the first half of a pair.
  if (before == WordScanner::Kind::kPair) {
    result.words.pop_back();
    result.prefix = false;
  } else {
    result.prefix = true;
  }
  return result;
}

std::vector<std::string> Trigrams(std::string_view text, size_t limit) {
  const std::string folded = FoldText(text);
  std::vector<size_t> starts;
  for (size_t pos = 0; pos < folded.size(); pos += DecodeAt(folded, pos).length_bytes) starts.push_back(pos);
  starts.push_back(folded.size());
  std::vector<std::string> grams;
  for (size_t i = 0; i + 3 < starts.size() && grams.size() < limit; ++i) {
    grams.push_back(folded.substr(starts[i], starts[i + 3] - starts[i]));
  }
  return grams;
}

}  // namespace ferrox::engine
