#include "services/kovacontentextractd/readers/audio_chunks.h"

#include <algorithm>
#include <bit>
#include <string>

#include "services/kovacontentextractd/readers/audio_tags.h"
#include "services/kovacontentextractd/readers/big_endian.h"
#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

constexpr size_t kChunkTextMaxBytes = 64U << 10;
constexpr int kChunksMax = 1000;

/// What a format's head says of its sound.
struct Sound {
  const char* codec = "";
  double rate = 0;
  uint64_t channels = 0;
  uint64_t bits = 0;  ///< of a sample; 0 when packed
  double seconds = 0;
};

void AddSound(const Sound& sound, Findings& findings) {
  findings.Set(field::kKOVAMDMediaTypes, "Sound");
  findings.Set(field::kKOVAMDCodecs, sound.codec);
  if (!(sound.rate > 0 && sound.rate < 1e8) || sound.channels == 0 || sound.channels > 1000) return;
  findings.SetInteger(field::kKOVAMDAudioSampleRate, static_cast<int64_t>(sound.rate));
  findings.SetInteger(field::kKOVAMDAudioChannelCount, static_cast<int64_t>(sound.channels));
  if (sound.seconds > 0) findings.SetNumber(field::kKOVAMDDurationSecond, sound.seconds);
  const double bits_a_second = sound.rate * static_cast<double>(sound.channels * sound.bits);
  if (sound.bits > 0) findings.SetInteger(field::kKOVAMDAudioBitRate, static_cast<int64_t>(bits_a_second));
}

/// How long that many bytes of samples play.
double SecondsOf(uint64_t bytes, const Sound& sound) {
  const double bits_a_second = sound.rate * static_cast<double>(sound.channels * sound.bits);
  return bits_a_second > 0 ? static_cast<double>(bytes) * 8 / bits_a_second : 0;
}

/// What names of texts these formats have beside those of the library.
std::string TagOf(std::string_view name) {
  static constexpr std::pair<std::string_view, const char*> kOther[] = {
      {"TRACK", "TRACKNUMBER"}, {"TRACK NUMBER", "TRACKNUMBER"}, {"COMMENTS", "COMMENT"},
      {"YEAR", "DATE"},         {"RECORDED DATE", "DATE"},       {"ENCODING APPLICATION", "ENCODING"},
      {"TEMPO", "BPM"},         {"KEY SIGNATURE", "INITIALKEY"},
  };
  std::string upper(name);
  for (char& c : upper) {
    if (c >= 'a' && c <= 'z') c = static_cast<char>(c - 'a' + 'A');
  }
  for (const auto& [other, tag] : kOther) {
    if (upper == other) return tag;
  }
  return upper;
}

/// The text before the first `end`, which is taken off with it.
std::string_view TakeUntil(std::string_view& rest, char end) {
  const std::string_view text = rest.substr(0, rest.find(end));
  rest.remove_prefix(std::min(text.size() + 1, rest.size()));
  return text;
}

/// Most programs write lines such as "title=...", others plain text.
void AddAnnotation(std::string_view text, TagLib::PropertyMap& tags) {
  text = text.substr(0, text.find('\0'));
  while (!text.empty()) {
    std::string_view line = TakeUntil(text, '\n');
    const bool is_named = line.find('=') != std::string_view::npos;
    AddText(is_named ? TagOf(TakeUntil(line, '=')) : "COMMENT", line, tags);
  }
}

/// A chunk's name and place.
struct Chunk {
  std::string name;
  uint64_t at = 0, size = 0;
};

/// Gives the chunks of a file to `take`: a name of 4 bytes, the size in `size_bytes`, the content, a byte more where
/// the size is odd and `even`.
template <typename Take>
void EachChunk(const FileBytes& file, uint64_t at, size_t size_bytes, bool even, Take take) {
  for (int count = 0; count < kChunksMax && at < file.Size(); ++count) {
    const std::string head = file.ReadAt(at, 4 + size_bytes);
    if (head.size() < 4 + size_bytes) return;
    at += head.size();
    const uint64_t left = file.Size() - at;
    const uint64_t size = std::min(BigEndian(head, 4, size_bytes), left);  // that of the last may be unknown: all bits
    take(Chunk{head.substr(0, 4), at, size});
    at += size + (even ? size % 2 : 0);
  }
}

/// A chunk's content, as far as a text may be long.
std::string TextOf(const FileBytes& file, const Chunk& chunk) {
  return file.ReadAt(chunk.at, static_cast<size_t>(std::min<uint64_t>(chunk.size, kChunkTextMaxBytes)));
}

/// The chunk "desc": rate (a double, 8 bytes), codec (4, at 8), flags (4), bytes of a packet (4, at 10), frames of a
/// packet (4, at 14), channels (4, at 18), bits of a sample (4, at 1C). `frame_bytes` stays 0 where a packet has
/// several frames.
void ReadCafFormat(const std::string& format, Sound& sound, uint64_t& frame_bytes) {
  static constexpr std::pair<std::string_view, const char*> kCodecs[] = {
      {"lpcm", "PCM"},  {"alac", "ALAC"}, {"aac ", "AAC"},    {"ima4", "ADPCM"}, {".mp3", "MP3"},
      {"opus", "Opus"}, {"flac", "FLAC"}, {"ulaw", "mu-law"}, {"alaw", "A-law"},
  };
  sound.rate = std::bit_cast<double>(BigEndian(format, 0, 8));
  sound.channels = BigEndian(format, 24, 4);
  sound.bits = BigEndian(format, 28, 4);
  frame_bytes = BigEndian(format, 20, 4) == 1 ? BigEndian(format, 16, 4) : 0;
  for (const auto& [name, codec] : kCodecs) {
    if (std::string_view(format).substr(8, 4) == name) sound.codec = codec;
  }
}

/// The chunk "info": a count (4 bytes), then names and texts in turn, each ended by a zero.
void AddCafTexts(std::string_view texts, TagLib::PropertyMap& tags) {
  texts.remove_prefix(std::min<size_t>(4, texts.size()));
  while (!texts.empty()) {
    const std::string_view name = TakeUntil(texts, '\0');
    AddText(TagOf(name), TakeUntil(texts, '\0'), tags);
  }
}

}  // namespace

void AddText(std::string_view name, std::string_view bytes, TagLib::PropertyMap& tags) {
  const std::string key(name), text(bytes.substr(0, bytes.find('\0')));
  if (text.empty() || (tags.contains(key) && key != "COMMENT")) return;
  const auto encoding = IsUtf8(text, false) ? TagLib::String::UTF8 : TagLib::String::Latin1;
  tags.insert(key, TagLib::StringList(TagLib::String(text, encoding)));
}

bool ReadAu(const Source& source, Findings& findings) {
  constexpr size_t kHeadBytes = 24;
  const FileBytes file(source);
  const std::string head = file.ReadAt(0, kHeadBytes);
  if (head.size() < kHeadBytes || !head.starts_with(".snd")) return false;
  struct Encoding {
    const char* codec;
    uint64_t bits;
  };
  static constexpr Encoding kEncodings[] = {{"", 0},     {"mu-law", 8}, {"PCM", 8},  {"PCM", 16},
                                            {"PCM", 24}, {"PCM", 32},   {"PCM", 32}, {"PCM", 64}};
  constexpr Encoding kALaw = {"A-law", 8}, kPacked = {"ADPCM", 0};
  const uint64_t number = BigEndian(head, 12, 4), at = BigEndian(head, 4, 4);
  const Encoding encoding = number < std::size(kEncodings) ? kEncodings[number] : number == 27 ? kALaw : kPacked;
  Sound sound = {encoding.codec, static_cast<double>(BigEndian(head, 16, 4)), BigEndian(head, 20, 4), encoding.bits};
  sound.seconds = SecondsOf(file.Size() - std::min(at, file.Size()), sound);
  AddSound(sound, findings);
  TagLib::PropertyMap tags;
  if (at > kHeadBytes) AddAnnotation(TextOf(file, {"", kHeadBytes, at - kHeadBytes}), tags);
  AddTags(tags, findings);
  return true;
}

bool ReadCaf(const Source& source, Findings& findings) {
  const FileBytes file(source);
  if (!file.ReadAt(0, 8).starts_with("caff")) return false;
  Sound sound;
  TagLib::PropertyMap tags;
  uint64_t frame_bytes = 0, data_bytes = 0, frames = 0;
  EachChunk(file, 8, 8, false, [&](const Chunk& chunk) {
    if (chunk.name == "desc") ReadCafFormat(TextOf(file, chunk), sound, frame_bytes);
    if (chunk.name == "pakt") frames = BigEndian(file.ReadAt(chunk.at + 8, 8), 0, 8);
    if (chunk.name == "data") data_bytes = chunk.size;
    if (chunk.name == "info") AddCafTexts(TextOf(file, chunk), tags);
  });
  if (frames == 0 && frame_bytes > 0) frames = data_bytes / frame_bytes;
  if (sound.rate > 0) sound.seconds = static_cast<double>(frames) / sound.rate;
  AddSound(sound, findings);
  AddTags(tags, findings);
  return true;
}

void AddAiffTexts(const Source& source, TagLib::PropertyMap& tags) {
  static constexpr std::pair<const char*, const char*> kTexts[] = {
      {"NAME", "TITLE"}, {"AUTH", "ARTIST"}, {"(c) ", "COPYRIGHT"}, {"ANNO", "COMMENT"}};
  const FileBytes file(source);
  EachChunk(file, 12, 4, true, [&](const Chunk& chunk) {
    for (const auto& [name, tag] : kTexts) {
      if (chunk.name == name) AddText(tag, TextOf(file, chunk), tags);
    }
  });
}

}  // namespace ferrox::extract
