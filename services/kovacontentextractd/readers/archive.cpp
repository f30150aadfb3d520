#include "services/kovacontentextractd/readers/archive.h"

#include <archive.h>
#include <archive_entry.h>
#include <locale.h>

#include <algorithm>
#include <memory>
#include <vector>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/member_names.h"
#include "services/kovacontentextractd/readers/zip_container.h"

namespace ferrox::extract {

namespace {

// The library detects packings ("filters") and formats by itself and reads through callbacks: the worker has an open
// descriptor and no file name. ZIP files are read by ZipContainer where that can be: their list of names stands at the
// end, and need not be searched for.

/// How much the library is given at a time.
constexpr size_t kArchivePieceBytes = 64U << 10;
/// Of a packed archive, all must be unpacked to find the names in it: no more than takes a few seconds.
constexpr int64_t kUnpackedMaxBytes = 1LL << 30;
constexpr int kNamesMax = 200000;

struct Free {
  void operator()(archive* reader) const { (void)archive_read_free(reader); }
};

/// What the library reads from.
struct Input {
  explicit Input(const Source& source) : file(source), piece(kArchivePieceBytes) {}
  FileBytes file;
  uint64_t at = 0;
  std::vector<char> piece;
  int64_t unpacked = -1;  ///< so far, and what was read since without any more
  uint64_t read_in_vain = 0;
};

/// Whether the library has read much of the file without unpacking any more: some packings allow padding behind their
/// data, of any length, which is no reason to read a whole disk image.
bool LeadsNowhere(archive* reader, Input& input) {
  constexpr uint64_t kReadInVainMaxBytes = 16U << 20;
  const int64_t unpacked = archive_filter_bytes(reader, 0);
  if (unpacked != input.unpacked) input.read_in_vain = 0;
  input.unpacked = unpacked;
  return input.read_in_vain > kReadInVainMaxBytes;
}

// What the library calls: to read on, to pass bytes, to go to a place.
la_ssize_t OnRead(archive* reader, void* data, const void** buffer) {
  auto& input = *static_cast<Input*>(data);
  if (LeadsNowhere(reader, input)) return 0;
  const size_t got = input.file.ReadAt(input.at, input.piece.data(), input.piece.size());
  input.at += got;
  input.read_in_vain += got;
  *buffer = input.piece.data();
  return static_cast<la_ssize_t>(got);
}

la_int64_t OnSkip(archive*, void* data, la_int64_t count) {
  auto& input = *static_cast<Input*>(data);
  const uint64_t left = input.file.Size() - std::min(input.at, input.file.Size());
  const uint64_t skipped = std::min(left, static_cast<uint64_t>(std::max<la_int64_t>(count, 0)));
  input.at += skipped;
  return static_cast<la_int64_t>(skipped);
}

la_int64_t OnSeek(archive*, void* data, la_int64_t offset, int whence) {
  auto& input = *static_cast<Input*>(data);
  const auto size = static_cast<la_int64_t>(input.file.Size());
  const la_int64_t base = whence == SEEK_CUR ? static_cast<la_int64_t>(input.at) : whence == SEEK_END ? size : 0;
  if (offset < -base || offset > size - base) return ARCHIVE_FATAL;
  input.at = static_cast<uint64_t>(base + offset);
  return static_cast<la_int64_t>(input.at);
}

/// A reader that has found packings and format, or null where there is none.
std::unique_ptr<archive, Free> Open(Input& input) {
  std::unique_ptr<archive, Free> reader(archive_read_new());
  archive* const raw = reader.get();
  // One by one: the library's "all" has packings that it starts programs for.
  for (const auto support :
       {&archive_read_support_filter_gzip,    &archive_read_support_filter_bzip2,    &archive_read_support_filter_xz,
        &archive_read_support_filter_lzma,    &archive_read_support_filter_lzip,     &archive_read_support_filter_zstd,
        &archive_read_support_filter_lz4,     &archive_read_support_filter_compress, &archive_read_support_filter_rpm,
        &archive_read_support_format_tar,     &archive_read_support_format_zip,      &archive_read_support_format_7zip,
        &archive_read_support_format_rar,     &archive_read_support_format_rar5,     &archive_read_support_format_cpio,
        &archive_read_support_format_ar,      &archive_read_support_format_cab,      &archive_read_support_format_lha,
        &archive_read_support_format_iso9660, &archive_read_support_format_raw}) {
    (void)support(raw);
  }
  (void)archive_read_set_callback_data(raw, &input);
  (void)archive_read_set_read_callback(raw, &OnRead);
  (void)archive_read_set_skip_callback(raw, &OnSkip);
  (void)archive_read_set_seek_callback(raw, &OnSeek);
  if (archive_read_open1(raw) != ARCHIVE_OK) reader.reset();
  return reader;
}

/// Whether what was unpacked so far is within the limits.
bool Fits(archive* reader, Findings& findings) {
  const Limits& limits = findings.Bounds();
  const auto packed = static_cast<uint64_t>(std::max<int64_t>(0, archive_filter_bytes(reader, -1)));
  const auto unpacked = static_cast<uint64_t>(std::max<int64_t>(0, archive_filter_bytes(reader, 0)));
  if (unpacked > std::max(limits.expansion_free, limits.expansion_ratio * packed)) {
    findings.Fail("expands to too much");
    return false;
  }
  if (unpacked > kUnpackedMaxBytes) findings.Fail("too large");
  return unpacked <= kUnpackedMaxBytes;
}

/// Unpacks until `take` wants no more. False at damage, and when the limits are reached.
template <typename Take>
bool Unpack(archive* reader, Findings& findings, Take take) {
  const void* block;
  size_t size;
  la_int64_t offset;
  int result;
  while ((result = archive_read_data_block(reader, &block, &size, &offset)) == ARCHIVE_OK) {
    if (!Fits(reader, findings)) return false;
    if (!take(std::string_view(static_cast<const char*>(block), size))) return true;
  }
  return result == ARCHIVE_EOF;
}

/// Passes a member. In a packed archive that means unpacking it, bit by bit so that the limits are kept.
bool SkipMember(archive* reader, Findings& findings) {
  if (archive_filter_count(reader) <= 1) return archive_read_data_skip(reader) >= ARCHIVE_WARN;
  return Unpack(reader, findings, [](std::string_view) { return true; });
}

/// The library turns names into the encoding of the locale, and drops those that it does not have.
locale_t Utf8Locale() {
  static const locale_t locale = newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
  return locale;
}

/// Gives this thread a locale in UTF-8 for as long as it lives.
class Utf8Names {
 public:
  Utf8Names() : before_(uselocale(Utf8Locale())) {}
  ~Utf8Names() { (void)uselocale(before_); }
  Utf8Names(const Utf8Names&) = delete;
  Utf8Names& operator=(const Utf8Names&) = delete;

 private:
  locale_t before_;
};

/// The name as UTF-8 where the library can say that, else as bytes.
const char* NameOf(archive_entry* entry) {
  const char* name = archive_entry_pathname_utf8(entry);
  return name != nullptr ? name : archive_entry_pathname(entry);
}

/// What is no archive may be one packed file.
void AddPackedFile(archive* reader, Findings& findings) {
  if (archive_filter_count(reader) <= 1) return findings.Fail("damaged");
  std::string bytes;
  const size_t limit = 2 * findings.Bounds().text_bytes;
  const bool good = Unpack(reader, findings, [&](std::string_view piece) {
    bytes += piece.substr(0, limit - bytes.size());
    return bytes.size() < limit;
  });
  if (!good) findings.Fail("damaged");
  DecodedText decoded;
  if (Decode(bytes, bytes.size() == limit, {}, decoded)) (void)findings.AddText(decoded.text);
}

const char* ProblemOf(archive* reader) {
  return archive_read_has_encrypted_entries(reader) > 0 ? "encrypted" : "damaged";
}

/// Goes through the members, without their content where the format allows that.
void AddNames(archive* reader, MemberNames& names, Findings& findings) {
  for (int count = 0; count < kNamesMax; ++count) {
    archive_entry* entry = nullptr;
    const int result = archive_read_next_header(reader, &entry);
    if (result == ARCHIVE_EOF) return;
    if (result < ARCHIVE_WARN) return findings.Fail(ProblemOf(reader));
    if (archive_format(reader) == ARCHIVE_FORMAT_RAW) return AddPackedFile(reader, findings);
    const char* name = NameOf(entry);
    if (name != nullptr && !names.Add(name)) return;
    if (!SkipMember(reader, findings)) return findings.Fail(ProblemOf(reader));
  }
  findings.MarkCut();
}

/// The names of a ZIP file, out of the list at its end. False when it has none that makes sense.
bool AddZipNames(const Source& source, MemberNames& names) {
  Findings unused;
  const ZipContainer zip(source, unused);
  int count = 0;
  zip.EachName([&](const char* bytes, const char* utf8) { return names.Add(bytes, utf8) && ++count < kNamesMax; });
  return zip.IsOpen();
}

}  // namespace

void PrepareArchive() { (void)Utf8Locale(); }

void ReadArchive(const Source& source, Findings& findings) {
  MemberNames names(findings);
  if (FileBytes(source).ReadAt(0, 2) == "PK" && AddZipNames(source, names)) return names.Finish();
  const Utf8Names scope;
  Input input(source);
  const std::unique_ptr<archive, Free> reader = Open(input);
  if (reader == nullptr) return findings.Fail("damaged");
  AddNames(reader.get(), names, findings);
  names.Finish();
}

}  // namespace ferrox::extract
