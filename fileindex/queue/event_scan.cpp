#include "fileindex/queue/event_scan.h"

#include <cstddef>
#include <cstring>

namespace ferrox::fileindex {

namespace {

enum Member : unsigned { kNone = 0, kEvent = 1, kIsDir = 2, kPath = 4, kPathOld = 8, kData = 16 };

// A text is searched for its end eight bytes at a time: a word has a zero byte exactly if
// (word - kEachByte) & ~word & kHighBits is not 0, and a byte below 0x20 exactly if (word - kEachByte * 0x20) & ~word &
// kHighBits is not 0. A byte of 0x80 or more, as in UTF-8, is neither. Bytes above the first hit may be reported in
// error, by the borrow; since the end is then searched byte by byte, that costs no correctness.
constexpr uint64_t kEachByte = 0x0101010101010101u;
constexpr uint64_t kHighBits = kEachByte * 0x80;

/// Whether any of the eight bytes ends a plain text: a quote, a backslash or a control character.
bool HasTextEnd(uint64_t word) {
  const uint64_t quote = word ^ (kEachByte * '"');
  const uint64_t escape = word ^ (kEachByte * '\\');
  return (((word - kEachByte * 0x20) & ~word) | ((quote - kEachByte) & ~quote) | ((escape - kEachByte) & ~escape)) &
         kHighBits;
}

bool IsTextEnd(char c) { return c == '"' || c == '\\' || static_cast<unsigned char>(c) < 0x20; }

/// Reads one line from left to right, without going back and without memory of its own. What it does not know, even
/// where JSON allows it (an escape, a further member, a number such as 6.4e1), ends the scan with false.
class Scanner {
 public:
  explicit Scanner(std::string_view line) : at_(line.data()), end_(at_ + line.size()) {}

  /// "fields" may be partly filled when this fails.
  bool Scan(EventFields& fields) {
    if (!Take('{')) return false;
    unsigned seen = 0;
    do {
      const unsigned member = ReadKey();
      if (member == 0 || (seen & member) != 0 || !ReadValue(member, fields)) return false;
      seen |= member;
    } while (Take(','));
    constexpr unsigned kRequired = kEvent | kPath;
    if ((seen & kRequired) != kRequired || !Take('}')) return false;
    SkipBlanks();
    return at_ == end_;
  }

 private:
  void SkipBlanks() {
    while (at_ != end_ && (*at_ == ' ' || *at_ == '\t' || *at_ == '\r' || *at_ == '\n')) ++at_;
  }

  /// Steps over blanks and then `c`, if it is next.
  bool Take(char c) {
    SkipBlanks();
    if (at_ == end_ || *at_ != c) return false;
    ++at_;
    return true;
  }

  /// Steps over exactly this text, if it is next.
  template <size_t size>
  bool TakeText(const char (&text)[size]) {
    constexpr size_t kLength = size - 1;
    if (static_cast<size_t>(end_ - at_) < kLength || memcmp(at_, text, kLength) != 0) return false;
    at_ += kLength;
    return true;
  }

  /// The member whose key and colon are next, 0 when it is none of ours.
  unsigned ReadKey() {
    if (!Take('"')) return 0;
    unsigned member = 0;
    if (TakeText("path")) {
      member = TakeText("\"") ? kPath : TakeText("_old\"") ? kPathOld : kNone;
    } else if (TakeText("event\"")) {
      member = kEvent;
    } else if (TakeText("is_dir\"")) {
      member = kIsDir;
    } else if (TakeText("data\"")) {
      member = kData;
    }
    return member != 0 && Take(':') ? member : 0;
  }

  bool ReadValue(unsigned member, EventFields& fields) {
    SkipBlanks();
    switch (member) {
      case kEvent:
        return ReadNumber(fields.event);
      case kIsDir:
        return (fields.is_dir = TakeText("true")) || TakeText("false");
      case kPath:
        return ReadText(fields.path);
      case kPathOld:
        return ReadText(fields.path_old);
      default:
        return TakeText("null");
    }
  }

  /// A natural number of 32 bits, as JSON writes it: no sign, no leading zero. Eleven digits are read at most, which is
  /// one more than such a number has.
  bool ReadNumber(uint32_t& number) {
    const char* const start = at_;
    uint64_t value = 0;
    while (at_ != end_ && *at_ >= '0' && *at_ <= '9' && at_ - start < 11) {
      value = value * 10 + static_cast<uint64_t>(*at_++ - '0');
    }
    number = static_cast<uint32_t>(value);
    const bool has_leading_zero = at_ - start > 1 && *start == '0';
    return at_ != start && !has_leading_zero && value <= UINT32_MAX;
  }

  /// A text without escapes: what it says lies in the line as it is.
  bool ReadText(std::string_view& text) {
    if (at_ == end_ || *at_ != '"') return false;
    const char* const start = ++at_;
    uint64_t word = 0;
    while (static_cast<size_t>(end_ - at_) >= sizeof(word)) {
      memcpy(&word, at_, sizeof(word));
      if (HasTextEnd(word)) break;
      at_ += sizeof(word);
    }
    while (at_ != end_ && !IsTextEnd(*at_)) ++at_;
    if (at_ == end_ || *at_ != '"') return false;
    text = {start, static_cast<size_t>(at_ - start)};
    ++at_;
    return true;
  }

  const char* at_;  ///< what is to be read next
  const char* end_;
};

}  // namespace

bool ScanPlainEvent(std::string_view line, EventFields& fields) { return Scanner(line).Scan(fields); }

}  // namespace ferrox::fileindex
