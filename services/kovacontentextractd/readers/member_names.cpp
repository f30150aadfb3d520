#include "services/kovacontentextractd/readers/member_names.h"

#include <algorithm>

#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/latin1.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

bool IsHigh(char c) { return (c & 0x80) != 0; }

/// The words that are not plain: of the others, extensions above all, statistics would only learn that they are Latin.
/// What is below '@' is part of no character of several bytes.
std::string ForeignWords(std::string_view names) {
  std::string words;
  while (!names.empty()) {
    const auto end = std::find_if(names.begin(), names.end(), [](char c) { return c >= 0 && c < '@'; });
    const std::string_view word = names.substr(0, static_cast<size_t>(end - names.begin()));
    if (std::any_of(word.begin(), word.end(), &IsHigh)) words.append(word).append(1, ' ');
    names.remove_prefix(std::min(word.size() + 1, names.size()));
  }
  return words;
}

/// Cyrillic words have no Latin letters between theirs. Which encoding they are in, the places of its letters tell:
/// those of the DOS one end at 0xAF and go on at 0xE0, and most letters are small.
std::string CyrillicEncoding(std::string_view words) {
  size_t latin = 0, dos = 0, first_half = 0, second_half = 0;
  for (const char c : words) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte >= '@' && byte < 0x80) ++latin;
    if (byte >= 0x80 && byte < 0xB0) ++dos;
    if (byte >= 0xC0 && byte < 0xE0) ++first_half;
    if (byte >= 0xE0) ++second_half;
  }
  const size_t high = dos + first_half + second_half;
  if (high < 3 || latin * 4 > high) return {};
  if (dos > first_half) return "IBM866";
  return dos > 0 ? "" : second_half >= first_half ? "WINDOWS-1251" : "KOI8-U";
}

}  // namespace

/// The statistics are made for prose, so the words of all names are given to them together, again and again until they
/// are a text of some length. They are believed where they say an East Asian or Cyrillic encoding; Western and
/// Central European ones look too much alike.
std::string EncodingOfNames(std::string_view names) {
  static constexpr const char* kTelling[] = {"CP932", "EUC-JP", "GB18030", "BIG5-HKSCS", "UHC", "IBM866", "KOI8-U"};
  constexpr size_t kSampleBytes = 600;  // what the statistics want to see
  const std::string words = ForeignWords(names.substr(0, 1U << 16));
  if (words.empty()) return {};
  std::string sample;
  while (sample.size() < kSampleBytes) sample += words + '\n';
  DecodedText decoded;
  if (Decode(sample, false, {}, decoded)) {
    const auto telling = std::find(std::begin(kTelling), std::end(kTelling), decoded.encoding);
    if (telling != std::end(kTelling)) return decoded.encoding;
  }
  return CyrillicEncoding(words);
}

bool MemberNames::Add(std::string_view name, std::string_view otherwise) {
  const bool is_utf8 = IsUtf8(name, false);
  names_.push_back({std::string(name), is_utf8 ? std::string() : std::string(otherwise)});
  std::string& bytes = names_.back().bytes;
  std::replace(bytes.begin(), bytes.end(), '\n', ' ');
  bytes_ += name.size() + 1;
  return bytes_ <= findings_.Bounds().text_bytes;
}

/// Decodes the names that are not UTF-8, all with one encoding: one system has packed them.
void MemberNames::DecodeOld() {
  std::string old;
  for (const Name& name : names_) {
    if (!IsUtf8(name.bytes, false)) old += name.bytes + '\n';
  }
  const std::string encoding = EncodingOfNames(old);
  DecodedText decoded;
  const bool good = !encoding.empty() && Decode(old, false, encoding, decoded);
  std::string_view rest = decoded.text;
  for (Name& name : names_) {
    if (IsUtf8(name.bytes, false)) continue;
    const std::string_view line = rest.substr(0, rest.find('\n'));
    rest.remove_prefix(std::min(line.size() + 1, rest.size()));
    name.bytes = good ? std::string(line) : name.otherwise.empty() ? Utf8OrLatin1(name.bytes) : name.otherwise;
  }
}

void MemberNames::Finish() {
  DecodeOld();
  for (const Name& name : names_) {
    if (!findings_.AddText(name.bytes)) return;
    findings_.Break();
  }
}

}  // namespace ferrox::extract
