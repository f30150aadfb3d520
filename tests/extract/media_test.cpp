#include <gtest/gtest.h>

#include "services/kovacontentextractd/readers/audio.h"
#include "services/kovacontentextractd/readers/video/video.h"
#include "tests/extract/reader_support.h"

namespace ferrox::extract::test {

namespace {

std::string Frame(const std::string& id, const std::string& content) {
  return id + Big(content.size(), 4) + std::string(2, '\0') + content;
}

std::string Id3() {
  const std::string title("\x01\xFF\xFE\x1F\x04\x35\x04\x41\x04\x3D\x04\x4F\x04", 13);  // in UTF-16
  const std::string frames = Frame("TIT2", title) + Frame("TPE1", std::string("\0Bj\xF6rk", 6)) +
                             Frame("TALB", std::string("\0Gr\xC3\xBC\xC3\x9F"
                                                       "e",
                                                       8)) +
                             Frame("TCOM", std::string("\0Bach", 5)) +
                             Frame("TRCK", std::string("\0"
                                                       "3/12",
                                                       5)) +
                             Frame("TYER", std::string("\0"
                                                       "1999",
                                                       5)) +
                             Frame("TCON", std::string("\0(8)", 4));
  return std::string("ID3\x03\0\0\0\0", 8) + static_cast<char>(frames.size() >> 7) +
         static_cast<char>(frames.size() & 0x7F) + frames;
}

/// 128 kbit/s, 44.1 kHz, two channels, a quarter of a second.
std::string Mp3() {
  std::string file = Id3();
  for (int i = 0; i < 10; ++i) file += std::string("\xFF\xFB\x90\x04", 4) + std::string(413, '\0');
  return file;
}

std::string Flac() {
  const auto comment = [](const std::string& text) { return Little(text.size(), 4) + text; };
  const std::string comments =
      comment("test") + Little(3, 4) + comment("TITLE=Ночь") + comment("ARTIST=Anna") + comment("ARTIST=Ben");
  // 48 kHz, two channels, 16 bits, 96,000 samples.
  const std::string information = Big(4096, 2) + Big(4096, 2) + Big(0, 6) + Big(0x0BB802F000017700ULL, 8) + Big(0, 16);
  return "fLaC" + Big(information.size(), 4) + information + '\x84' + Big(comments.size(), 3) + comments +
         std::string(100, '\0');
}

std::string Wav() {
  const std::string format =
      Little(1, 2) + Little(2, 2) + Little(8000, 4) + Little(32000, 4) + Little(4, 2) + Little(16, 2);
  const std::string title = "INAM" + Little(6, 4) + "Probe" + '\0';
  const std::string chunks = "WAVEfmt " + Little(16, 4) + format + "LIST" + Little(4 + title.size(), 4) + "INFO" +
                             title + "data" + Little(16000, 4) + std::string(16000, '\0');
  return "RIFF" + Little(chunks.size(), 4) + chunks;
}

std::string Dsf() {
  const std::string tag = Id3();
  const std::string format = "fmt " + Little(52, 8) + Little(1, 4) + Little(0, 4) + Little(2, 4) + Little(2, 4) +
                             Little(2822400, 4) + Little(1, 4) + Little(5644800, 8) + Little(4096, 4) + Little(0, 4);
  return "DSD " + Little(28, 8) + Little(92 + tag.size(), 8) + Little(92, 8) + format + "data" + Little(12, 8) + tag;
}

std::string Box(const std::string& name, const std::string& content) {
  return Big(content.size() + 8, 4) + name + content;
}

/// Two seconds of 640 x 360, without a single picture.
std::string Mp4() {
  const std::string entry =
      Box("avc1", Big(0, 6) + Big(1, 2) + Big(0, 16) + Big(640, 2) + Big(360, 2) + Big(0x480000, 4) + Big(0x480000, 4) +
                      Big(0, 4) + Big(1, 2) + Big(0, 32) + Big(24, 2) + Big(0xFFFF, 2));
  const std::string table =
      Box("stbl",
          Box("stsd", Big(0, 4) + Big(1, 4) + entry) + Box("stts", Big(0, 4) + Big(1, 4) + Big(50, 4) + Big(40, 4)) +
              Box("stsz", Big(0, 4) + Big(10, 4) + Big(50, 4)) + Box("stsc", Big(0, 8)) + Box("stco", Big(0, 8)));
  const std::string track =
      Box("trak", Box("tkhd", Big(7, 4) + Big(0, 8) + Big(1, 4) + Big(0, 4) + Big(2000, 4) + Big(0, 52) +
                                  Big(640 << 16, 4) + Big(360 << 16, 4)) +
                      Box("mdia", Box("mdhd", Big(0, 12) + Big(1000, 4) + Big(2000, 4) + Big(0, 4)) +
                                      Box("hdlr", Big(0, 8) + "vide" + Big(0, 13)) + Box("minf", table)));
  const std::string name = Box("ilst", Box("\xA9nam", Box("data", Big(1, 4) + Big(0, 4) + "Été à Nîmes")));
  const std::string tags = Box("udta", Box("meta", Big(0, 4) + Box("hdlr", Big(0, 8) + "mdirappl" + Big(0, 9)) + name));
  return Box("ftyp", "isom" + Big(0, 4) + "isommp42") +
         Box("moov",
             Box("mvhd", Big(0, 12) + Big(1000, 4) + Big(2000, 4) + Big(0x10000, 4) + Big(0, 76)) + track + tags) +
         Box("mdat", std::string(500, '\0'));
}

std::string Element(const std::string& id, const std::string& content) {
  return id + '\x10' + Big(content.size(), 3) + content;
}

std::string Matroska() {
  const std::string duration("\x45\x1C\x40\0", 4);  // 2500.0
  const std::string information =
      Element("\x15\x49\xA9\x66",
              Element("\x2A\xD7\xB1", Big(1000000, 3)) + Element("\x44\x89", duration) + Element("\x7B\xA9", "Фильм"));
  const std::string track =
      Element("\xAE", Element("\xD7", "\x01") + Element("\x83", "\x01") + Element("\x86", "V_VP9") +
                          Element("\xE0", Element("\xB0", Big(1280, 2)) + Element("\xBA", Big(720, 2))));
  return Element("\x1A\x45\xDF\xA3", Element("\x42\x82", "matroska")) +
         Element("\x18\x53\x80\x67", information + Element("\x16\x54\xAE\x6B", track) +
                                         Element("\x1F\x43\xB6\x75", Element("\xE7", std::string(1, '\0'))));
}

}  // namespace

TEST(AudioTest, Mp3) {
  const Json::Value document = Read(&ReadAudio, Mp3(), "mp3");
  EXPECT_EQ("Песня", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Björk", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ("Grüße", Text(document, "KOVAMDAlbum"));  // UTF-8 in a field of Latin-1
  EXPECT_EQ("Bach", Text(document, "KOVAMDComposer"));
  EXPECT_EQ("Jazz", Text(document, "KOVAMDMusicalGenre"));
  EXPECT_EQ(3, document["KOVAMDAudioTrackNumber"].asInt());
  EXPECT_EQ(1999, document["KOVAMDRecordingYear"].asInt());
  EXPECT_EQ(128000, document["KOVAMDAudioBitRate"].asInt());
  EXPECT_EQ(44100, document["KOVAMDAudioSampleRate"].asInt());
  EXPECT_EQ(2, document["KOVAMDAudioChannelCount"].asInt());
  EXPECT_EQ("MP3", Text(document, "KOVAMDCodecs"));
  EXPECT_EQ("Sound", Text(document, "KOVAMDMediaTypes"));
}

TEST(AudioTest, TagsInEncodingsThatTheyDoNotName) {
  const auto frames = [](const std::string& title, const std::string& artist, const std::string& album) {
    const std::string all = Frame("TIT2", '\0' + title) + Frame("TPE1", '\0' + artist) + Frame("TALB", '\0' + album);
    return std::string("ID3\x03\0\0\0\0\0", 9) + static_cast<char>(all.size()) + all + Mp3().substr(Id3().size());
  };
  // "Кино", "Группа крови", "Лучшие песни" in Windows-1251; German that is Latin-1.
  Json::Value document = Read(&ReadAudio, frames("\xC3\xF0\xF3\xEF\xEF\xE0 \xEA\xF0\xEE\xE2\xE8", "\xCA\xE8\xED\xEE",
                                                 "\xCB\xF3\xF7\xF8\xE8\xE5 \xEF\xE5\xF1\xED\xE8"));
  EXPECT_EQ("Группа крови", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Кино", Text(document, "KOVAMDAuthors"));
  document = Read(&ReadAudio, frames("\xDC"
                                     "ber",
                                     "Die \xC4rzte", "M\xE4nner"));
  EXPECT_EQ("Über", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Die Ärzte", Text(document, "KOVAMDAuthors"));
}

TEST(AudioTest, OtherKinds) {
  Json::Value document = Read(&ReadAudio, Flac(), "flac");
  EXPECT_EQ("Ночь", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Anna, Ben", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ(2.0, document["KOVAMDDurationSecond"].asDouble());
  EXPECT_EQ(48000, document["KOVAMDAudioSampleRate"].asInt());

  document = Read(&ReadAudio, Wav(), "wav");
  EXPECT_EQ("Probe", Text(document, "KOVAMDTitle"));
  EXPECT_EQ(0.5, document["KOVAMDDurationSecond"].asDouble());

  document = Read(&ReadAudio, Dsf(), "dsf");
  EXPECT_EQ("Песня", Text(document, "KOVAMDTitle"));
  EXPECT_EQ(2.0, document["KOVAMDDurationSecond"].asDouble());
  EXPECT_EQ(2822400, document["KOVAMDAudioSampleRate"].asInt());
  EXPECT_EQ("DSD", Text(document, "KOVAMDCodecs"));

  EXPECT_EQ("MP3", Text(Read(&ReadAudio, Mp3(), "wma"), "KOVAMDCodecs")) << "the content counts, not the name";
  EXPECT_EQ("damaged", Text(Read(&ReadAudio, "no sound", "flac"), "_KOVAExtractError"));
}

TEST(VideoTest, SizesDurationsAndTitles) {
  Json::Value document = Read(&ReadVideo, Mp4(), "mp4");
  EXPECT_EQ("Été à Nîmes", Text(document, "KOVAMDTitle"));
  EXPECT_EQ(640, document["KOVAMDPixelWidth"].asInt());
  EXPECT_EQ(360, document["KOVAMDPixelHeight"].asInt());
  EXPECT_EQ(2.0, document["KOVAMDDurationSecond"].asDouble());
  EXPECT_EQ("AVC", Text(document, "KOVAMDCodecs"));
  EXPECT_EQ("Video", Text(document, "KOVAMDMediaTypes"));

  document = Read(&ReadVideo, Matroska(), "mkv");
  EXPECT_EQ("Фильм", Text(document, "KOVAMDTitle"));
  EXPECT_EQ(1280, document["KOVAMDPixelWidth"].asInt());
  EXPECT_EQ(2.5, document["KOVAMDDurationSecond"].asDouble());
  EXPECT_EQ("VP9", Text(document, "KOVAMDCodecs"));

  EXPECT_EQ("damaged", Text(Read(&ReadVideo, "no film", "mp4"), "_KOVAExtractError"));
}

TEST(MediaTest, DamageIsBorne) {
  Abuse(&ReadAudio, Mp3(), "mp3");
  Abuse(&ReadAudio, Flac(), "flac");
  Abuse(&ReadAudio, Wav(), "wav");
  Abuse(&ReadAudio, Dsf(), "dsf");
  Abuse(&ReadVideo, Mp4(), "mp4", 100);
  Abuse(&ReadVideo, Matroska(), "mkv", 100);
}

}  // namespace ferrox::extract::test
