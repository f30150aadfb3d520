#include "services/kovacontentextractd/readers/audio.h"

#include <charconv>
#include <exception>
#include <memory>
#include <new>
#include <string>
#include <taglib/aifffile.h>
#include <taglib/apefile.h>
#include <taglib/asffile.h>
#include <taglib/fileref.h>
#include <taglib/flacfile.h>
#include <taglib/mp4file.h>
#include <taglib/mpcfile.h>
#include <taglib/mpegfile.h>
#include <taglib/opusfile.h>
#include <taglib/speexfile.h>
#include <taglib/tdebuglistener.h>
#include <taglib/tpropertymap.h>
#include <taglib/vorbisfile.h>
#include <taglib/wavfile.h>
#include <taglib/wavpackfile.h>

#include "services/kovacontentextractd/readers/audio_stream.h"
#include "services/kovacontentextractd/readers/latin1.h"
#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

struct TagField {
  const char* tag;
  const char* field;
};

constexpr TagField kTextTags[] = {
    {"TITLE", "KOVAMDTitle"},
    {"ALBUM", "KOVAMDAlbum"},
    {"ARTIST", "KOVAMDAuthors"},
    {"ALBUMARTIST", "KOVAMDAuthors"},
    {"PERFORMER", "KOVAMDContributors"},
    {"CONDUCTOR", "KOVAMDContributors"},
    {"COMPOSER", "KOVAMDComposer"},
    {"LYRICIST", "KOVAMDLyricist"},
    {"GENRE", "KOVAMDMusicalGenre"},
    {"COMMENT", "KOVAMDComment"},
    {"DESCRIPTION", "KOVAMDDescription"},
    {"COPYRIGHT", "KOVAMDCopyright"},
    {"LABEL", "KOVAMDPublishers"},
    {"LANGUAGE", "KOVAMDLanguages"},
    {"INITIALKEY", "KOVAMDKeySignature"},
    {"BPM", "KOVAMDTempo"},
    {"ENCODING", "KOVAMDAudioEncodingApplication"},
    {"ENCODEDBY", "KOVAMDEncodingApplications"},
};

int64_t LeadingNumber(const std::string& text) {
  int64_t number = 0;
  (void)std::from_chars(text.data(), text.data() + text.size(), number);
  return number;
}

/// The encoding of the texts that are no Latin-1 although their tag says so; empty when they may be.
std::string EncodingOf(const TagLib::PropertyMap& tags) {
  std::string texts;
  for (const TagField& row : kTextTags) {
    const auto found = tags.find(row.tag);
    if (found == tags.end()) continue;
    for (const TagLib::String& value : found->second) {
      if (value.isLatin1() && !value.isAscii() && texts.size() < 4096) texts += value.to8Bit(true) + "\n";
    }
  }
  return TrueEncoding(texts);
}

void AddTags(const TagLib::PropertyMap& tags, Findings& findings) {
  const std::string encoding = EncodingOf(tags);
  for (const TagField& row : kTextTags) {
    const auto found = tags.find(row.tag);
    if (found == tags.end()) continue;
    for (const TagLib::String& value : found->second) {
      const std::string text = WithoutDoubleEncoding(value.to8Bit(true));
      findings.Append(row.field, encoding.empty() ? text : InTrueEncoding(text, encoding));
    }
  }
  const auto first = [&](const char* tag) {
    const auto found = tags.find(tag);
    return found != tags.end() && !found->second.isEmpty() ? found->second.front().to8Bit(true) : std::string();
  };
  const int64_t track = LeadingNumber(first("TRACKNUMBER")), year = LeadingNumber(first("DATE"));
  if (track > 0) findings.SetInteger("KOVAMDAudioTrackNumber", track);
  if (year > 0 && year <= 9999) findings.SetInteger("KOVAMDRecordingYear", year);
  if (const auto time = ParseTime(first("DATE"))) findings.SetInteger("KOVAMDContentCreationDate", *time);
  const auto words = tags.find("LYRICS");
  if (words != tags.end()) (void)findings.AddText(words->second.toString("\n").to8Bit(true));
}

void AddProperties(const TagLib::AudioProperties& properties, Findings& findings) {
  findings.Set("KOVAMDMediaTypes", "Sound");
  if (properties.lengthInMilliseconds() > 0) {
    findings.SetNumber("KOVAMDDurationSecond", properties.lengthInMilliseconds() / 1000.0);
  }
  if (properties.bitrate() > 0) findings.SetInteger("KOVAMDAudioBitRate", int64_t{properties.bitrate()} * 1000);
  if (properties.sampleRate() > 0) findings.SetInteger("KOVAMDAudioSampleRate", properties.sampleRate());
  if (properties.channels() > 0) findings.SetInteger("KOVAMDAudioChannelCount", properties.channels());
}

const char* CodecOf(const TagLib::File& file) {
  if (dynamic_cast<const TagLib::MPEG::File*>(&file) != nullptr) return "MP3";
  if (dynamic_cast<const TagLib::FLAC::File*>(&file) != nullptr) return "FLAC";
  if (dynamic_cast<const TagLib::Ogg::Vorbis::File*>(&file) != nullptr) return "Vorbis";
  if (dynamic_cast<const TagLib::Ogg::Opus::File*>(&file) != nullptr) return "Opus";
  if (dynamic_cast<const TagLib::Ogg::Speex::File*>(&file) != nullptr) return "Speex";
  if (dynamic_cast<const TagLib::APE::File*>(&file) != nullptr) return "APE";
  if (dynamic_cast<const TagLib::WavPack::File*>(&file) != nullptr) return "WavPack";
  if (dynamic_cast<const TagLib::MPC::File*>(&file) != nullptr) return "Musepack";
  if (dynamic_cast<const TagLib::ASF::File*>(&file) != nullptr) return "WMA";
  if (dynamic_cast<const TagLib::RIFF::WAV::File*>(&file) != nullptr) return "PCM";
  if (dynamic_cast<const TagLib::RIFF::AIFF::File*>(&file) != nullptr) return "PCM";
  const auto* mp4 = dynamic_cast<const TagLib::MP4::File*>(&file);
  if (mp4 == nullptr || mp4->audioProperties() == nullptr) return "";
  return mp4->audioProperties()->codec() == TagLib::MP4::Properties::ALAC ? "ALAC" : "AAC";
}

uint64_t LittleAt(const std::string& bytes, size_t at, int count) {
  uint64_t value = 0;
  for (int i = count - 1; i >= 0; --i) value = value << 8 | static_cast<uint8_t>(bytes[at + static_cast<size_t>(i)]);
  return value;
}

/// DSF: two chunks of fixed size, and at the end a tag as MP3 has it. The library does not know it.
void ReadDsf(const Source& source, const std::string& head, Findings& findings) {
  constexpr size_t kHeadBytes = 80;
  if (head.size() < kHeadBytes || head.compare(28, 4, "fmt ") != 0) return findings.Fail("damaged");
  findings.Set("KOVAMDMediaTypes", "Sound");
  findings.Set("KOVAMDCodecs", "DSD");
  const uint64_t channels = LittleAt(head, 52, 4), rate = LittleAt(head, 56, 4), samples = LittleAt(head, 64, 8);
  if (rate > 0) findings.SetNumber("KOVAMDDurationSecond", static_cast<double>(samples) / static_cast<double>(rate));
  findings.SetInteger("KOVAMDAudioSampleRate", static_cast<int64_t>(rate));
  findings.SetInteger("KOVAMDAudioChannelCount", static_cast<int64_t>(channels));
  findings.SetInteger("KOVAMDBitsPerSample", static_cast<int64_t>(LittleAt(head, 60, 4)));
  findings.SetInteger("KOVAMDAudioBitRate", static_cast<int64_t>(rate * channels));
  const uint64_t tag_at = LittleAt(head, 20, 8);
  if (tag_at == 0 || tag_at >= source.size) return;
  AudioStream tag(source, tag_at, source.size, "tag.mp3");
  const TagLib::MPEG::File file(&tag, TagLib::ID3v2::FrameFactory::instance(), false);
  if (file.isValid()) AddTags(file.properties(), findings);
}

void ReadTagged(const Source& source, Findings& findings) {
  AudioStream stream(source, 0, source.size, "file." + source.extension);
  const TagLib::FileRef reference(&stream);
  const TagLib::File* file = reference.file();
  if (reference.isNull() || !file->isValid()) return findings.Fail("damaged");
  AddTags(file->properties(), findings);
  if (file->audioProperties() != nullptr) AddProperties(*file->audioProperties(), findings);
  findings.Set("KOVAMDCodecs", CodecOf(*file));
}

/// The library complains on standard error otherwise.
class Silence : public TagLib::DebugListener {
 public:
  void printMessage(const TagLib::String&) override {}
};

}  // namespace

void PrepareAudio() {
  static Silence silence;
  TagLib::setDebugListener(&silence);
}

void ReadAudio(const Source& source, Findings& findings) {
  PrepareAudio();
  try {
    const std::string head = FileBytes(source).ReadAt(0, 80);
    if (head.compare(0, 4, "DSD ") == 0) return ReadDsf(source, head, findings);
    ReadTagged(source, findings);
  } catch (const std::bad_alloc&) {
    findings.Fail("needs too much memory");
  } catch (const std::exception&) {
    findings.Fail("damaged");
  }
}

}  // namespace ferrox::extract
