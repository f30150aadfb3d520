#include "services/kovacontentextractd/readers/zip_container.h"

#include <unistd.h>
#include <zip.h>

#include <algorithm>
#include <cctype>

namespace ferrox::extract {

/// One open member.
class ZipMember : public ByteSource {
 public:
  ZipMember(ZipContainer& container, zip_file_t* file) : container_(container), file_(file) {}
  ~ZipMember() override { (void)zip_fclose(file_); }
  ZipMember(const ZipMember&) = delete;
  ZipMember& operator=(const ZipMember&) = delete;

  /// Unpacks on. A member ends where it is damaged or a limit is reached, which the findings are told.
  size_t Read(char* buffer, size_t room) override {
    if (ended_ || container_.exhausted_) return 0;
    const zip_int64_t got = zip_fread(file_, buffer, room);
    ended_ = got <= 0;
    if (got < 0) container_.findings_.Fail("damaged");
    if (ended_) return 0;
    read_ += static_cast<uint64_t>(got);
    if (read_ > container_.findings_.Bounds().member_bytes) {
      container_.findings_.Fail("expands to too much");
      ended_ = true;
    }
    return !ended_ && container_.Spend(static_cast<uint64_t>(got)) ? static_cast<size_t>(got) : 0;
  }

 private:
  ZipContainer& container_;
  zip_file_t* file_;
  uint64_t read_ = 0;
  bool ended_ = false;
};

namespace {

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

/// Digits count as one number: "slide2" before "slide10". Names that only differ in leading zeros are equal.
bool NaturalLess(const std::string& a, const std::string& b) {
  size_t i = 0, k = 0;
  while (i < a.size() && k < b.size()) {
    if (!IsDigit(a[i]) || !IsDigit(b[k])) {
      if (a[i] != b[k]) return static_cast<unsigned char>(a[i]) < static_cast<unsigned char>(b[k]);
      ++i, ++k;
      continue;
    }
    const auto number = [](const std::string& text, size_t& at) {
      uint64_t value = 0;
      for (; at < text.size() && IsDigit(text[at]); ++at) value = value * 10 + static_cast<uint64_t>(text[at] - '0');
      return value;
    };
    const uint64_t first = number(a, i), second = number(b, k);
    if (first != second) return first < second;
  }
  return a.size() - i < b.size() - k;
}

}  // namespace

ZipContainer::ZipContainer(const Source& source, Findings& findings) : findings_(findings), file_bytes_(source.size) {
  const int fd = dup(source.fd);
  int error = 0;
  if (fd >= 0 && lseek(fd, 0, SEEK_SET) == 0) archive_ = zip_fdopen(fd, 0, &error);
  if (archive_ != nullptr) return;
  if (fd >= 0) (void)close(fd);
  findings_.Fail("damaged");
}

ZipContainer::~ZipContainer() {
  if (archive_ != nullptr) zip_discard(archive_);
}

int64_t ZipContainer::Locate(std::string_view name) const {
  std::string spelled(name);
  const zip_int64_t exact = zip_name_locate(archive_, spelled.c_str(), 0);
  if (exact >= 0) return exact;
  const zip_int64_t other_case = zip_name_locate(archive_, spelled.c_str(), ZIP_FL_NOCASE);
  if (other_case >= 0) return other_case;
  std::replace(spelled.begin(), spelled.end(), '/', '\\');
  return zip_name_locate(archive_, spelled.c_str(), ZIP_FL_NOCASE);
}

bool ZipContainer::Has(std::string_view name) const { return archive_ != nullptr && Locate(name) >= 0; }

std::unique_ptr<ByteSource> ZipContainer::Open(std::string_view name) {
  if (archive_ == nullptr || exhausted_) return nullptr;
  const int64_t index = Locate(name);
  zip_stat_t info;
  if (index < 0 || zip_stat_index(archive_, static_cast<zip_uint64_t>(index), 0, &info) != 0) return nullptr;
  zip_file_t* file = zip_fopen_index(archive_, static_cast<zip_uint64_t>(index), 0);
  if (file == nullptr) {
    // Not asked of `info`: behind its time it lies elsewhere for the library than for us, where the times' sizes
    // differ.
    findings_.Fail(zip_error_code_zip(zip_get_error(archive_)) == ZIP_ER_NOPASSWD ? "encrypted" : "damaged");
    return nullptr;
  }
  // Members may overlap and be opened twice: together they are never more than the file.
  packed_bytes_ = std::min(file_bytes_, packed_bytes_ + std::min(info.comp_size, file_bytes_));
  return std::make_unique<ZipMember>(*this, file);
}

std::string ZipContainer::ReadMember(std::string_view name, size_t limit_bytes) {
  const std::unique_ptr<ByteSource> member = Open(name);
  return member != nullptr ? ReadAll(*member, limit_bytes) : std::string();
}

bool ZipContainer::Spend(uint64_t bytes) {
  const Limits& limits = findings_.Bounds();
  unpacked_bytes_ += bytes;
  const uint64_t allowed = std::max(limits.expansion_free, limits.expansion_ratio * packed_bytes_);
  constexpr uint64_t kUnpackedMaxBytes = 256U << 20;  // a file may name the same member again and again
  exhausted_ = unpacked_bytes_ > std::min(allowed, kUnpackedMaxBytes);
  if (exhausted_) findings_.Fail("expands to too much");
  return !exhausted_;
}

std::vector<std::string> ZipContainer::Names(std::string_view begin, std::string_view end, size_t limit) const {
  std::vector<std::string> names;
  const zip_int64_t count = archive_ != nullptr ? zip_get_num_entries(archive_, 0) : 0;
  for (zip_int64_t i = 0; i < count && names.size() < limit; ++i) {
    const char* name = zip_get_name(archive_, static_cast<zip_uint64_t>(i), 0);
    const std::string_view view = name != nullptr ? name : "";
    if (view.size() >= begin.size() + end.size() && view.starts_with(begin) && view.ends_with(end)) {
      names.emplace_back(view);
    }
  }
  std::sort(names.begin(), names.end(), &NaturalLess);
  return names;
}

void ZipContainer::EachName(const std::function<bool(const char* bytes, const char* utf8)>& add) const {
  const zip_int64_t count = archive_ != nullptr ? zip_get_num_entries(archive_, 0) : 0;
  for (zip_int64_t i = 0; i < count; ++i) {
    const char* bytes = zip_get_name(archive_, static_cast<zip_uint64_t>(i), ZIP_FL_ENC_RAW);
    const char* utf8 = zip_get_name(archive_, static_cast<zip_uint64_t>(i), 0);
    if (bytes != nullptr && utf8 != nullptr && !add(bytes, utf8)) return;
  }
}

}  // namespace ferrox::extract
