#include "services/kovacontentextractd/readers/audio.h"

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
#include <taglib/oggflacfile.h>
#include <taglib/oggpageheader.h>
#include <taglib/opusfile.h>
#include <taglib/speexfile.h>
#include <taglib/tdebuglistener.h>
#include <taglib/tpropertymap.h>
#include <taglib/trueaudiofile.h>
#include <taglib/vorbisfile.h>
#include <taglib/wavfile.h>
#include <taglib/wavpackfile.h>

#include "services/kovacontentextractd/readers/audio_chunks.h"
#include "services/kovacontentextractd/readers/audio_stream.h"
#include "services/kovacontentextractd/readers/audio_tags.h"
#include "services/kovacontentextractd/readers/little_endian.h"

namespace ferrox::extract {

namespace {

/// Length, rates and channels, where the library found them.
void AddProperties(const TagLib::AudioProperties& properties, Findings& findings) {
  findings.Set(field::kKOVAMDMediaTypes, "Sound");
  if (properties.lengthInMilliseconds() > 0) {
    findings.SetNumber(field::kKOVAMDDurationSecond, properties.lengthInMilliseconds() / 1000.0);
  }
  if (properties.bitrate() > 0) findings.SetInteger(field::kKOVAMDAudioBitRate, int64_t{properties.bitrate()} * 1000);
  if (properties.sampleRate() > 0) findings.SetInteger(field::kKOVAMDAudioSampleRate, properties.sampleRate());
  if (properties.channels() > 0) findings.SetInteger(field::kKOVAMDAudioChannelCount, properties.channels());
}

/// By the number that a WAV file has for it.
const char* WavCodec(int format) {
  switch (format) {
    case 1:
    case 3:
      return "PCM";
    case 2:
    case 0x11:
      return "ADPCM";
    case 6:
      return "A-law";
    case 7:
      return "mu-law";
    case 0x50:
      return "MP2";
    case 0x55:
      return "MP3";
    default:
      return "";
  }
}

/// The codec's usual name; "" where the format does not tell. The library has a class for each format, not a name.
const char* CodecOf(const TagLib::File& file) {
  if (const auto* mpeg = dynamic_cast<const TagLib::MPEG::File*>(&file)) {
    return mpeg->audioProperties() != nullptr && mpeg->audioProperties()->layer() == 2 ? "MP2" : "MP3";
  }
  if (const auto* mp4 = dynamic_cast<const TagLib::MP4::File*>(&file)) {
    if (mp4->audioProperties() == nullptr) return "";
    return mp4->audioProperties()->codec() == TagLib::MP4::Properties::ALAC ? "ALAC" : "AAC";
  }
  if (const auto* wav = dynamic_cast<const TagLib::RIFF::WAV::File*>(&file)) {
    return wav->audioProperties() != nullptr ? WavCodec(wav->audioProperties()->format()) : "";
  }
  if (dynamic_cast<const TagLib::FLAC::File*>(&file) != nullptr) return "FLAC";
  if (dynamic_cast<const TagLib::Ogg::FLAC::File*>(&file) != nullptr) return "FLAC";
  if (dynamic_cast<const TagLib::Ogg::Vorbis::File*>(&file) != nullptr) return "Vorbis";
  if (dynamic_cast<const TagLib::Ogg::Opus::File*>(&file) != nullptr) return "Opus";
  if (dynamic_cast<const TagLib::Ogg::Speex::File*>(&file) != nullptr) return "Speex";
  if (dynamic_cast<const TagLib::APE::File*>(&file) != nullptr) return "APE";
  if (dynamic_cast<const TagLib::WavPack::File*>(&file) != nullptr) return "WavPack";
  if (dynamic_cast<const TagLib::MPC::File*>(&file) != nullptr) return "Musepack";
  if (dynamic_cast<const TagLib::ASF::File*>(&file) != nullptr) return "WMA";
  if (dynamic_cast<const TagLib::TrueAudio::File*>(&file) != nullptr) return "TTA";
  if (dynamic_cast<const TagLib::RIFF::AIFF::File*>(&file) != nullptr) return "PCM";
  return "";
}

/// The library reads the tags of each format, but not all that says the same in other places of the file.
void AddOtherTexts(const Source& source, TagLib::File& file, TagLib::PropertyMap& tags) {
  if (dynamic_cast<const TagLib::RIFF::AIFF::File*>(&file) != nullptr) AddAiffTexts(source, tags);
  const auto* wav = dynamic_cast<const TagLib::RIFF::WAV::File*>(&file);
  if (wav == nullptr || !wav->hasInfoTag()) return;
  static constexpr std::pair<const char*, const char*> kInfo[] = {{"ICOP", "COPYRIGHT"},
                                                                  {"ISFT", "ENCODING"},
                                                                  {"IENG", "PERFORMER"},
                                                                  {"ILNG", "LANGUAGE"},
                                                                  {"ISBJ", "DESCRIPTION"}};
  for (const auto& [name, tag] : kInfo) AddText(tag, wav->InfoTag()->fieldText(name).to8Bit(true), tags);
}

/// FLAC in Ogg that was written as it was recorded does not know its length; its last page does.
void AddOggLength(TagLib::File& file, Findings& findings) {
  auto* ogg = dynamic_cast<TagLib::Ogg::FLAC::File*>(&file);
  if (ogg == nullptr || ogg->audioProperties() == nullptr || ogg->audioProperties()->lengthInMilliseconds() > 0) return;
  const int rate = ogg->audioProperties()->sampleRate();
  const TagLib::Ogg::PageHeader* last = ogg->lastPageHeader();
  if (rate > 0 && last != nullptr && last->absoluteGranularPosition() > 0) {
    findings.SetNumber(field::kKOVAMDDurationSecond, static_cast<double>(last->absoluteGranularPosition()) / rate);
  }
}

/// DSF, which the library does not know: a chunk "DSD " of 28 bytes with the place of the tag (at 14), a chunk "fmt "
/// with channels (at 34), rate (at 38), bits of a sample (at 3C) and samples (at 40), numbers with the low byte first;
/// at the end a tag as MP3 has it.
void ReadDsf(const Source& source, const std::string& head, Findings& findings) {
  constexpr size_t kHeadBytes = 80;
  if (head.size() < kHeadBytes || head.compare(28, 4, "fmt ") != 0) return findings.Fail("damaged");
  findings.Set(field::kKOVAMDMediaTypes, "Sound");
  findings.Set(field::kKOVAMDCodecs, "DSD");
  const uint64_t channels = LittleEndian(head, 52, 4), rate = LittleEndian(head, 56, 4),
                 samples = LittleEndian(head, 64, 8);
  if (rate > 0)
    findings.SetNumber(field::kKOVAMDDurationSecond, static_cast<double>(samples) / static_cast<double>(rate));
  findings.SetInteger(field::kKOVAMDAudioSampleRate, static_cast<int64_t>(rate));
  findings.SetInteger(field::kKOVAMDAudioChannelCount, static_cast<int64_t>(channels));
  findings.SetInteger(field::kKOVAMDBitsPerSample, static_cast<int64_t>(LittleEndian(head, 60, 4)));
  findings.SetInteger(field::kKOVAMDAudioBitRate, static_cast<int64_t>(rate * channels));
  const uint64_t tag_at = LittleEndian(head, 20, 8);
  if (tag_at == 0 || tag_at >= source.size) return;
  AudioStream tag(source, tag_at, source.size, "tag.mp3");
  const TagLib::MPEG::File file(&tag, TagLib::ID3v2::FrameFactory::instance(), false);
  if (file.isValid()) AddTags(file.properties(), findings);
}

/// Any format of the library, which detects it by the extension and the first bytes.
void ReadTagged(const Source& source, Findings& findings) {
  AudioStream stream(source, 0, source.size, "file." + source.extension);
  const TagLib::FileRef reference(&stream);
  TagLib::File* file = reference.file();
  if (reference.isNull() || !file->isValid()) return findings.Fail("damaged");
  TagLib::PropertyMap tags = file->properties();
  AddOtherTexts(source, *file, tags);
  AddTags(tags, findings);
  if (file->audioProperties() != nullptr) AddProperties(*file->audioProperties(), findings);
  AddOggLength(*file, findings);
  findings.Set(field::kKOVAMDCodecs, CodecOf(*file));
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
    if (ReadAu(source, findings) || ReadCaf(source, findings)) return;
    ReadTagged(source, findings);
  } catch (const std::bad_alloc&) {
    findings.Fail("needs too much memory");
  } catch (const std::exception&) {
    findings.Fail("damaged");
  }
}

}  // namespace ferrox::extract
