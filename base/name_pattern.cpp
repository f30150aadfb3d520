#include "base/name_pattern.h"

#include <algorithm>
#include <array>
#include <limits>
#include <utility>

namespace base {

namespace {

constexpr size_t kSetsMax = std::numeric_limits<uint16_t>::max();

/// As in the locale "C", whatever the process's is.
bool IsOfClass(std::string_view name, unsigned char byte) {
  const bool is_digit = byte >= '0' && byte <= '9';
  const bool is_upper = byte >= 'A' && byte <= 'Z';
  const bool is_lower = byte >= 'a' && byte <= 'z';
  const bool is_graph = byte > 0x20 && byte < 0x7F;
  if (name == "alpha") return is_upper || is_lower;
  if (name == "digit") return is_digit;
  if (name == "alnum") return is_upper || is_lower || is_digit;
  if (name == "upper") return is_upper;
  if (name == "lower") return is_lower;
  if (name == "space") return byte == ' ' || (byte >= '\t' && byte <= '\r');
  if (name == "blank") return byte == ' ' || byte == '\t';
  if (name == "punct") return is_graph && !is_digit && !is_upper && !is_lower;
  if (name == "cntrl") return byte < 0x20 || byte == 0x7F;
  if (name == "print") return is_graph || byte == ' ';
  if (name == "graph") return is_graph;
  if (name == "xdigit") return is_digit || (byte >= 'A' && byte <= 'F') || (byte >= 'a' && byte <= 'f');
  return false;
}

bool IsClassName(std::string_view name) {
  for (unsigned byte = 0; byte < 0x80; ++byte) {
    if (IsOfClass(name, static_cast<unsigned char>(byte))) return true;
  }
  return false;
}

}  // namespace

bool NamePattern::Read(std::string_view text, size_t& at) {
  for (; at < text.size() && text[at] != '/'; ++at) {
    if (text[at] == '*') {
      if (!tokens_.empty() && tokens_.back().kind == Kind::kMany) continue;
      tokens_.push_back({Kind::kMany, 0});
      ++stars_;
    } else if (text[at] == '?') {
      tokens_.push_back({Kind::kOne, 0});
      ++ones_;
    } else if (text[at] == '[') {
      if (!ReadSet(text, at)) return false;
    } else {
      if (text[at] == '\\' && ++at == text.size()) return false;
      if (text[at] == '/') break;  // a slash parts names, escaped or not
      tokens_.push_back({Kind::kByte, static_cast<unsigned char>(text[at])});
    }
  }
  return true;
}

/// `at` is at the "[", and then at the "]". A "]" that comes first is a byte of the set.
bool NamePattern::ReadSet(std::string_view text, size_t& at) {
  if (sets_.size() >= kSetsMax) return false;
  Set set;
  size_t i = at + 1;
  const bool negated = i < text.size() && (text[i] == '!' || text[i] == '^');
  if (negated) ++i;
  bool may_be_range = false;
  unsigned from = 0;
  for (bool first = true; i < text.size() && (first || text[i] != ']'); first = false, ++i) {
    const size_t end = text.compare(i, 2, "[:") == 0 ? text.find(']', i + 2) : std::string_view::npos;
    if (text.compare(i, 2, "[:") == 0 && end == std::string_view::npos) return false;
    if (end != std::string_view::npos && end >= i + 3 && text[end - 1] == ':') {
      const std::string_view name = text.substr(i + 2, end - i - 3);
      if (!IsClassName(name)) return false;
      for (unsigned byte = 0; byte < 256; ++byte) {
        if (IsOfClass(name, static_cast<unsigned char>(byte))) set.set(byte);
      }
      i = end;
      may_be_range = false;
      continue;
    }
    const bool is_range = text[i] == '-' && may_be_range && i + 1 < text.size() && text[i + 1] != ']';
    if (is_range) ++i;
    if (text[i] == '\\' && ++i == text.size()) return false;
    const auto byte = static_cast<unsigned char>(text[i]);
    if (!is_range) from = byte;
    for (unsigned each = from; each <= byte; ++each) set.set(each);
    from = byte;
    may_be_range = !is_range;
  }
  if (i >= text.size()) return false;
  if (negated) set.flip();
  at = i;
  tokens_.push_back({Kind::kSet, static_cast<uint16_t>(sets_.size())});
  sets_.push_back(set);
  return true;
}

bool NamePattern::Fits(const Token& token, char byte) const {
  const auto value = static_cast<unsigned char>(byte);
  if (token.kind == Kind::kByte) return token.value == value;
  return token.kind == Kind::kOne || (token.kind == Kind::kSet && sets_[token.value].test(value));
}

/// What stands before the last star that was met stays matched as early as it could be: a later place for it gives the
/// rest no more room. So only the part behind that star is tried at each of the places that are left.
bool NamePattern::Matches(std::string_view name) const {
  if (name.size() < tokens_.size() - stars_) return false;
  size_t token = 0;
  size_t at = 0;
  size_t behind_star = std::string::npos;   // the token behind the last star
  size_t tried_at = 0;                      // where in the name that token was tried last
  size_t needed = tokens_.size() - stars_;  // bytes, by the tokens from `behind_star` on
  while (at < name.size() || token < tokens_.size()) {
    if (token < tokens_.size() && tokens_[token].kind == Kind::kMany) {
      needed -= behind_star == std::string::npos ? token : token - behind_star;
      behind_star = ++token;
      tried_at = at;
      if (token == tokens_.size()) return true;
    } else if (token < tokens_.size() && at < name.size() && Fits(tokens_[token], name[at])) {
      ++token;
      ++at;
    } else if (behind_star != std::string::npos && tried_at + needed < name.size()) {
      at = ++tried_at;
      token = behind_star;
    } else {
      return false;
    }
  }
  return true;
}

std::bitset<256> NamePattern::Begins() const {
  std::bitset<256> begins;
  const Token first = tokens_.empty() ? Token{Kind::kMany, 0} : tokens_.front();
  if (first.kind == Kind::kByte) return begins.set(first.value);
  return first.kind == Kind::kSet ? sets_[first.value] : begins.set();
}

bool NamePattern::IsExtension() const {
  const bool begins = tokens_.size() > 2 && tokens_[0].kind == Kind::kMany && tokens_[1].value == '.';
  if (!begins || stars_ != 1 || ones_ != 0 || !sets_.empty()) return false;
  return std::count_if(tokens_.begin() + 1, tokens_.end(), [](const Token& token) { return token.value == '.'; }) == 1;
}

std::string NamePattern::Literal() const {
  std::string literal;
  for (const Token& token : tokens_) {
    if (token.kind == Kind::kByte) literal += static_cast<char>(token.value);
  }
  return literal;
}

}  // namespace base
