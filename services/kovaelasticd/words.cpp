#include "services/kovaelasticd/words.h"

#include <array>

namespace ferrox::engine {

namespace {

/// The folded form of each ASCII letter and digit, 0 for what separates words.
constexpr std::array<char, 128> kAsciiFold = [] {
  std::array<char, 128> table{};
  for (char c = '0'; c <= '9'; ++c) table[static_cast<size_t>(c)] = c;
  for (char c = 'a'; c <= 'z'; ++c) {
    table[static_cast<size_t>(c)] = c;
    table[static_cast<size_t>(c - 'a' + 'A')] = c;
  }
  return table;
}();

bool IsAscii(char c) { return static_cast<unsigned char>(c) < 0x80; }

}  // namespace

bool WordScanner::Emit(Kind kind, size_t begin, size_t end) {
  kind_ = kind;
  begin_ = begin;
  end_ = end;
  return true;
}

void WordScanner::AppendToWord() {
  if (word_.size() + piece_.size() <= kWordMaxBytes) word_ += piece_;
}

bool WordScanner::Next() {
  word_.clear();
  while (pos_ < text_.size()) {
    if (previous_.empty()) {
      while (pos_ < text_.size() && IsAscii(text_[pos_]) && kAsciiFold[static_cast<size_t>(text_[pos_])] == 0) ++pos_;
      if (pos_ >= text_.size()) return false;
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
  word_.swap(previous_);
  previous_.clear();
  return Emit(Kind::kRunEnd, previous_begin_, previous_end_);
}

/// Takes a paired character; true when it completes a pair.
bool WordScanner::NextPair(const CodePoint& c) {
  const size_t begin = pos_;
  pos_ += c.length_bytes;
  const bool complete = !previous_.empty();
  if (complete) {
    word_ = previous_ + piece_;
    (void)Emit(Kind::kPair, previous_begin_, pos_);
  }
  previous_ = piece_;
  previous_begin_ = begin;
  previous_end_ = pos_;
  return complete;
}

bool WordScanner::NextPlainWord() {
  const size_t begin = pos_;
  size_t end = pos_;
  while (pos_ < text_.size()) {
    const char byte = text_[pos_];
    if (IsAscii(byte)) {
      const char folded = kAsciiFold[static_cast<size_t>(byte)];
      if (folded == 0) break;
      if (word_.size() < kWordMaxBytes) word_ += folded;
      end = ++pos_;
      continue;
    }
    const CodePoint c = DecodeAt(text_, pos_);
    piece_.clear();
    const CharClass char_class = FoldTo(piece_, c.value);
    if (char_class == CharClass::kSeparator || char_class == CharClass::kPaired) break;
    AppendToWord();
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
