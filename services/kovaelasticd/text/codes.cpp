#include "services/kovaelasticd/text/codes.h"

#include <algorithm>
#include <utility>

#include "services/kovaelasticd/text/code_bytes.h"
#include "services/kovaelasticd/text/code_run.h"

namespace ferrox::engine {

namespace {

constexpr size_t kPartMin = 2;
/// Longer words, and words that change more often, are no identifiers but encoded bytes.
constexpr size_t kIdentifierMax = 48;
constexpr size_t kIdentifierPartsMax = 6;
constexpr size_t kMeanPartMin = 3;
/// Of letters and digits: "AB1234", "2nd4th".
constexpr size_t kDigitChangesMax = 2;
constexpr size_t kShortPrefixMax = 4;

/// Whether a part ends before `pos`: "camel|Case", "HTTP|Request", "AB|1234".
bool IsBorder(std::string_view word, size_t pos) {
  const uint8_t before = CodeByte(word[pos - 1]);
  const uint8_t at = CodeByte(word[pos]);
  if ((before == kDigitByte) != (at == kDigitByte)) return true;
  if (before == kSmallByte && at == kCapitalByte) return true;
  return before == kCapitalByte && at == kCapitalByte && pos + 1 < word.size() && CodeByte(word[pos + 1]) == kSmallByte;
}

std::string FoldedAscii(std::string_view text) {
  std::string folded(text);
  for (char& c : folded) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return folded;
}

bool IsAlnum(char c) { return (CodeByte(c) & (kSmallByte | kCapitalByte | kDigitByte)) != 0; }

/// Whether a code can begin with the letters at `begin` .. `end`, which are no part of a longer name.
bool CodeFollows(std::string_view text, size_t begin, size_t end) {
  if (begin > 0 && std::string_view("-./_@\\%").find(text[begin - 1]) != std::string_view::npos) return false;
  return end + 1 < text.size() && std::string_view("-./_,: ").find(text[end]) != std::string_view::npos &&
         CodeByte(text[end + 1]) == kDigitByte;
}

/// How many bytes of the word at `begin` belong to an escape of roff: "\\fBbold", "\\f(CWcode", "\\s-1SMALL".
size_t EscapeBytes(std::string_view text, size_t begin) {
  constexpr std::string_view kFonts = "BIRPCWH";
  const auto before = [&](size_t bytes) { return begin < bytes ? '\0' : text[begin - bytes]; };
  if (before(1) == '\\') {
    return text[begin] == 'f' && begin + 1 < text.size() && kFonts.find(text[begin + 1]) != kFonts.npos ? 2 : 0;
  }
  if (before(1) == '(') return before(2) == 'f' && before(3) == '\\' ? 2 : 0;
  return (before(1) == '-' || before(1) == '+') && before(2) == 's' && before(3) == '\\' ? 1 : 0;
}

}  // namespace

const std::vector<std::string>& CodeScanner::At(size_t begin, size_t end) {
  if (!words_.empty()) words_.clear();
  const uint8_t first = CodeByte(text_[begin]);
  uint8_t inner = 0;
  for (size_t pos = begin + 1; pos < end; ++pos) inner |= CodeByte(text_[pos]);
  const auto mask = static_cast<uint8_t>(first | inner);
  if ((mask & kWideCodeByte) != 0) return words_;
  const size_t escape = EscapeBytes(text_, begin);
  if (escape > 0 && end - begin >= escape + kPartMin) {
    Add(FoldedAscii(text_.substr(begin + escape, end - begin - escape)));
    AddParts(begin + escape, end);
    return words_;
  }
  const bool digits = (mask & kDigitByte) != 0;
  if ((digits && mask != kDigitByte) || (inner & ~first & (kSmallByte | kCapitalByte)) == kCapitalByte ||
      ((inner & kCapitalByte) != 0 && (inner & kSmallByte) != 0)) {
    AddParts(begin, end);
  }
  if (digits || (end - begin <= kShortPrefixMax && CodeFollows(text_, begin, end))) AddJoined(begin);
  return words_;
}

/// Adds a word unless it was added lately. By a hash of fixed bits: the same text must always have the same words, as
/// they are taken out of the index by cutting it again.
void CodeScanner::Add(std::string word) {
  uint64_t hash = 0xCBF29CE484222325;
  for (const char c : word) hash = (hash ^ static_cast<unsigned char>(c)) * 0x100000001B3;
  uint64_t& place = added_[(hash >> 32) % added_.size()];
  if (place == hash) return;
  place = hash;
  words_.push_back(std::move(word));
}

/// Adds the parts of one word.
void CodeScanner::AddParts(size_t begin, size_t end) {
  const std::string_view word = text_.substr(begin, end - begin);
  if (word.size() > kIdentifierMax || word.size() < 2 * kPartMin) return;
  if (CodeByte(word[0]) == kDigitByte && CodeByte(word[1]) != kDigitByte) return;  // "2nd", an encoded byte
  size_t parts = 1;
  size_t digit_changes = 0;
  for (size_t pos = 1; pos < word.size(); ++pos) {
    if (!IsBorder(word, pos)) continue;
    ++parts;
    digit_changes += (CodeByte(word[pos - 1]) == kDigitByte) != (CodeByte(word[pos]) == kDigitByte) ? 1 : 0;
  }
  if (parts < 2 || parts > kIdentifierPartsMax || digit_changes > kDigitChangesMax ||
      word.size() < parts * kMeanPartMin)
    return;
  for (size_t first = 0, pos = 1; pos <= word.size(); ++pos) {
    if (pos < word.size() && !IsBorder(word, pos)) continue;
    if (pos - first >= kPartMin) Add(FoldedAscii(word.substr(first, pos - first)));
    first = pos;
  }
}

/// Adds the codes that begin with the word at `begin`, unless it lies within one.
void CodeScanner::AddJoined(size_t begin) {
  if (begin < tight_end_) return;
  CodeRun tight = ReadTightRun(text_, begin);
  if (tight.parts > 1) tight_end_ = tight.end;
  if (!tight.joined.empty()) Add(std::move(tight.joined));
  if (begin < wide_end_) return;
  CodeRun wide = ReadWideRun(text_, begin, false);
  wide_end_ = wide.end;
  if (!wide.joined.empty()) Add(std::move(wide.joined));
}

std::vector<std::string> JoinedCodes(std::string_view text) {
  const auto* first = std::find_if(text.begin(), text.end(), IsAlnum);
  text.remove_prefix(static_cast<size_t>(first - text.begin()));
  while (!text.empty() && !IsAlnum(text.back())) text.remove_suffix(1);
  for (CodeRun run : {ReadTightRun(text, 0), ReadWideRun(text, 0, true)}) {
    if (run.end == text.size() && !run.joined.empty()) return {std::move(run.joined)};
  }
  return {};
}

}  // namespace ferrox::engine
