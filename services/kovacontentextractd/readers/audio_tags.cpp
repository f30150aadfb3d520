#include "services/kovacontentextractd/readers/audio_tags.h"

#include <charconv>
#include <string>

#include "services/kovacontentextractd/readers/latin1.h"
#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

/// The library's name for a tag, which is the same for all formats, and the field that it fills.
struct TagField {
  const char* tag;
  const char* field;
};

constexpr TagField kTextTags[] = {
    {"TITLE", field::kKOVAMDTitle},
    {"ALBUM", field::kKOVAMDAlbum},
    {"ARTIST", field::kKOVAMDAuthors},
    {"ALBUMARTIST", field::kKOVAMDAuthors},
    {"PERFORMER", field::kKOVAMDContributors},
    {"CONDUCTOR", field::kKOVAMDContributors},
    {"COMPOSER", field::kKOVAMDComposer},
    {"LYRICIST", field::kKOVAMDLyricist},
    {"GENRE", field::kKOVAMDMusicalGenre},
    {"COMMENT", field::kKOVAMDComment},
    {"DESCRIPTION", field::kKOVAMDDescription},
    {"COPYRIGHT", field::kKOVAMDCopyright},
    {"LABEL", field::kKOVAMDPublishers},
    {"LANGUAGE", field::kKOVAMDLanguages},
    {"INITIALKEY", field::kKOVAMDKeySignature},
    {"BPM", field::kKOVAMDTempo},
    {"ENCODING", field::kKOVAMDAudioEncodingApplication},
    {"ENCODEDBY", field::kKOVAMDEncodingApplications},
};

/// The number at the beginning of "3/12" or "2024-03-01"; 0 when there is none.
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

}  // namespace

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
  if (track > 0) findings.SetInteger(field::kKOVAMDAudioTrackNumber, track);
  if (year > 0 && year <= 9999) findings.SetInteger(field::kKOVAMDRecordingYear, year);
  if (const auto time = ParseTime(first("DATE"))) findings.SetInteger(field::kKOVAMDContentCreationDate, *time);
  const auto words = tags.find("LYRICS");
  if (words != tags.end()) (void)findings.AddText(words->second.toString("\n").to8Bit(true));
}

}  // namespace ferrox::extract
