#include "services/kovacontentextractd/readers/video/video.h"

#include <MediaInfo/MediaInfo.h>
#include <algorithm>
#include <charconv>
#include <exception>
#include <new>
#include <string>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/cpu_budget.h"
#include "services/kovacontentextractd/readers/latin1.h"
#include "services/kovacontentextractd/readers/times.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

using MediaInfoLib::MediaInfo;
using MediaInfoLib::stream_t;

/// Of a film, what describes it is at its beginning and its end.
constexpr uint64_t kReadMaxBytes = 64U << 20;
/// How many times the library may ask for another place of the file.
constexpr int kJumpsMax = 1000;
constexpr std::chrono::milliseconds kCpuMax(1500);
constexpr size_t kPieceBytes = 64U << 10;

enum class Kind { kText, kInteger, kMilliseconds, kTime, kYear };

/// A value of the library by stream and name, and the field that it fills.
struct Row {
  stream_t stream;
  const wchar_t* name;
  const char* field;
  Kind kind = Kind::kText;
};

constexpr Row kRows[] = {
    {MediaInfoLib::Stream_General, L"Title", field::kKOVAMDTitle},
    {MediaInfoLib::Stream_General, L"Movie", field::kKOVAMDTitle},
    {MediaInfoLib::Stream_General, L"Track", field::kKOVAMDTitle},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.title", field::kKOVAMDTitle},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.displayname", field::kKOVAMDTitle},
    {MediaInfoLib::Stream_General, L"Album", field::kKOVAMDAlbum},
    {MediaInfoLib::Stream_General, L"Collection", field::kKOVAMDAlbum},
    {MediaInfoLib::Stream_General, L"Performer", field::kKOVAMDAuthors},
    {MediaInfoLib::Stream_General, L"Album/Performer", field::kKOVAMDAuthors},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.author", field::kKOVAMDAuthors},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.artist", field::kKOVAMDAuthors},
    {MediaInfoLib::Stream_General, L"Director", field::kKOVAMDContributors},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.director", field::kKOVAMDContributors},
    {MediaInfoLib::Stream_General, L"WrittenBy", field::kKOVAMDContributors},
    {MediaInfoLib::Stream_General, L"Actor", field::kKOVAMDParticipants},
    {MediaInfoLib::Stream_General, L"Composer", field::kKOVAMDComposer},
    {MediaInfoLib::Stream_General, L"Genre", field::kKOVAMDMusicalGenre},
    {MediaInfoLib::Stream_General, L"Comment", field::kKOVAMDComment},
    {MediaInfoLib::Stream_General, L"Description", field::kKOVAMDDescription},
    {MediaInfoLib::Stream_General, L"Synopsis", field::kKOVAMDDescription},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.comment", field::kKOVAMDComment},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.description", field::kKOVAMDDescription},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.keywords", field::kKOVAMDKeywords},
    {MediaInfoLib::Stream_General, L"Make", field::kKOVAMDAcquisitionMake},
    {MediaInfoLib::Stream_General, L"Model", field::kKOVAMDAcquisitionModel},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.make", field::kKOVAMDAcquisitionMake},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.model", field::kKOVAMDAcquisitionModel},
    {MediaInfoLib::Stream_General, L"Keywords", field::kKOVAMDKeywords},
    {MediaInfoLib::Stream_General, L"Copyright", field::kKOVAMDCopyright},
    {MediaInfoLib::Stream_General, L"Publisher", field::kKOVAMDPublishers},
    {MediaInfoLib::Stream_General, L"Encoded_Application", field::kKOVAMDEncodingApplications},
    {MediaInfoLib::Stream_General, L"Recorded_Location", field::kKOVAMDNamedLocation},
    {MediaInfoLib::Stream_General, L"Duration", field::kKOVAMDDurationSecond, Kind::kMilliseconds},
    {MediaInfoLib::Stream_General, L"OverallBitRate", field::kKOVAMDTotalBitRate, Kind::kInteger},
    {MediaInfoLib::Stream_General, L"Recorded_Date", field::kKOVAMDRecordingYear, Kind::kYear},
    {MediaInfoLib::Stream_General, L"Encoded_Date", field::kKOVAMDContentCreationDate, Kind::kTime},
    {MediaInfoLib::Stream_General, L"Mastered_Date", field::kKOVAMDContentCreationDate, Kind::kTime},
    {MediaInfoLib::Stream_General, L"Recorded_Date", field::kKOVAMDContentCreationDate, Kind::kTime},
    {MediaInfoLib::Stream_General, L"com.apple.quicktime.creationdate", field::kKOVAMDContentCreationDate, Kind::kTime},
    {MediaInfoLib::Stream_General, L"Track/Position", field::kKOVAMDAudioTrackNumber, Kind::kInteger},
    {MediaInfoLib::Stream_Video, L"Width", field::kKOVAMDPixelWidth, Kind::kInteger},
    {MediaInfoLib::Stream_Video, L"Height", field::kKOVAMDPixelHeight, Kind::kInteger},
    {MediaInfoLib::Stream_Video, L"BitRate", field::kKOVAMDVideoBitRate, Kind::kInteger},
    {MediaInfoLib::Stream_Audio, L"BitRate", field::kKOVAMDAudioBitRate, Kind::kInteger},
    {MediaInfoLib::Stream_Audio, L"SamplingRate", field::kKOVAMDAudioSampleRate, Kind::kInteger},
    {MediaInfoLib::Stream_Audio, L"Channel(s)", field::kKOVAMDAudioChannelCount, Kind::kInteger},
};

/// Names of tags as programs write them into files; the library has names of its own only for those that it expects.
constexpr struct {
  const wchar_t* names[2];
  const char* field;
} kFreeTags[] = {
    {{L"TITLE", L"title"}, field::kKOVAMDTitle},
    {{L"ALBUM", L"album"}, field::kKOVAMDAlbum},
    {{L"ARTIST", L"artist"}, field::kKOVAMDAuthors},
    {{L"DIRECTOR", L"director"}, field::kKOVAMDContributors},
    {{L"ACTOR", L"actor"}, field::kKOVAMDParticipants},
    {{L"COMPOSER", L"composer"}, field::kKOVAMDComposer},
    {{L"GENRE", L"genre"}, field::kKOVAMDMusicalGenre},
    {{L"COMMENT", L"comment"}, field::kKOVAMDComment},
    {{L"DESCRIPTION", L"description"}, field::kKOVAMDDescription},
    {{L"SYNOPSIS", L"synopsis"}, field::kKOVAMDDescription},
    {{L"SUMMARY", L"summary"}, field::kKOVAMDDescription},
    {{L"KEYWORDS", L"keywords"}, field::kKOVAMDKeywords},
    {{L"COPYRIGHT", L"copyright"}, field::kKOVAMDCopyright},
    {{L"PUBLISHER", L"publisher"}, field::kKOVAMDPublishers},
    {{L"LOCATION", L"location"}, field::kKOVAMDNamedLocation},
};
constexpr Row kFreeNumbers[] = {
    {MediaInfoLib::Stream_General, L"DATE", field::kKOVAMDRecordingYear, Kind::kYear},
    {MediaInfoLib::Stream_General, L"date", field::kKOVAMDRecordingYear, Kind::kYear},
    {MediaInfoLib::Stream_General, L"track", field::kKOVAMDAudioTrackNumber, Kind::kInteger},
    {MediaInfoLib::Stream_General, L"Part/Position", field::kKOVAMDAudioTrackNumber, Kind::kInteger},
};

std::string Utf8(const std::wstring& text) {
  std::string out;
  for (const wchar_t c : text) AppendUtf8(out, static_cast<uint32_t>(c));
  return WithoutDoubleEncoding(std::move(out));
}

std::string Value(MediaInfo& info, stream_t stream, size_t number, const wchar_t* name) {
  return Utf8(info.Get(stream, number, name));
}

void SetRow(const Row& row, std::string value, Findings& findings) {
  if (row.kind == Kind::kText) return findings.Append(row.field, value);
  if (row.kind == Kind::kTime) {
    if (value.starts_with("UTC ")) value.erase(0, 4);
    const auto time = ParseTime(value).value_or(0);  // 0: a field that nobody filled
    if (time > 0) findings.SetInteger(row.field, time);
    return;
  }
  double number = 0;
  const auto parsed = std::from_chars(value.data(), value.data() + value.size(), number);
  if (parsed.ptr == value.data() || number <= 0 || number > 9e15) return;
  if (row.kind == Kind::kMilliseconds) return findings.SetNumber(row.field, number / 1000);
  if (row.kind == Kind::kInteger || number <= 9999) findings.SetInteger(row.field, static_cast<int64_t>(number));
}

/// The tags that programs wrote under names of their own.
void AddFreeTags(MediaInfo& info, Findings& findings) {
  for (const auto& tag : kFreeTags) {
    for (const wchar_t* name : tag.names) {
      findings.Append(tag.field, Value(info, MediaInfoLib::Stream_General, 0, name));
    }
  }
  for (const Row& row : kFreeNumbers) SetRow(row, Value(info, row.stream, 0, row.name), findings);
}

/// Which kinds of streams there are, their codecs and languages.
void AddStreams(MediaInfo& info, Findings& findings) {
  constexpr size_t kStreamsMax = 100;
  const struct {
    stream_t stream;
    const char* type;
  } kTypes[] = {{MediaInfoLib::Stream_Video, "Video"},
                {MediaInfoLib::Stream_Audio, "Sound"},
                {MediaInfoLib::Stream_Text, "Text"}};
  for (const auto& row : kTypes) {
    const size_t count = std::min(info.Count_Get(row.stream), kStreamsMax);
    if (count > 0) findings.Append(field::kKOVAMDMediaTypes, row.type);
    for (size_t i = 0; i < count; ++i) {
      findings.Append(field::kKOVAMDCodecs, Value(info, row.stream, i, L"Format"));
      findings.Append(field::kKOVAMDLanguages, Value(info, row.stream, i, L"Language"));
    }
  }
}

/// Feeds the library, which says where it wants to read on.
void Feed(MediaInfo& info, const Source& source) {
  constexpr size_t kFinished = 8;
  const FileBytes file(source);
  std::string piece(kPieceBytes, '\0');
  const CpuBudget budget(kCpuMax);
  uint64_t at = 0, done = 0;
  (void)info.Open_Buffer_Init(source.size, 0);
  for (int jumps = 0; done < kReadMaxBytes && jumps < kJumpsMax && !budget.IsSpent();) {
    const size_t got = file.ReadAt(at, piece.data(), piece.size());
    if (got == 0) break;
    at += got;
    done += got;
    const size_t status = info.Open_Buffer_Continue(reinterpret_cast<const unsigned char*>(piece.data()), got);
    if ((status & kFinished) != 0) break;
    const uint64_t wanted = info.Open_Buffer_Continue_GoTo_Get();
    if (wanted == UINT64_MAX) continue;
    at = wanted;
    ++jumps;
    (void)info.Open_Buffer_Init(source.size, at);
  }
  (void)info.Open_Buffer_Finalize();
}

void ReadStreams(const Source& source, Findings& findings) {
  MediaInfo info;
  Feed(info, source);
  if (Value(info, MediaInfoLib::Stream_General, 0, L"Format").empty()) return findings.Fail("damaged");
  for (const Row& row : kRows) SetRow(row, Value(info, row.stream, 0, row.name), findings);
  AddFreeTags(info, findings);
  AddStreams(info, findings);
}

}  // namespace

void PrepareVideo() {
  (void)MediaInfo::Option_Static(L"ReadByHuman", L"0");
  // What stands in heads and tables, without a look at the pictures: the fields are the same, and of a film of 130 MB
  // half a MB is read in place of 15.
  (void)MediaInfo::Option_Static(L"ParseSpeed", L"0");
}

void ReadVideo(const Source& source, Findings& findings) {
  try {
    ReadStreams(source, findings);
  } catch (const std::bad_alloc&) {
    findings.Fail("needs too much memory");
  } catch (const std::exception&) {
    findings.Fail("damaged");
  }
}

}  // namespace ferrox::extract
