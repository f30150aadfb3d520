#include "services/kovacontentextractd/readers/converters.h"

#include <iconv.h>

#include <array>
#include <cerrno>
#include <map>
#include <vector>

#include "base/mutex.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

/// A thread's converters to UTF-8. Opening one loads a library, which costs more than converting a small file, so they
/// are kept.
class Converters {
 public:
  static inline const iconv_t kNone = reinterpret_cast<iconv_t>(-1);

  /// A converter in its initial state; kNone when there is no such encoding.
  static iconv_t Get(const std::string& encoding) {
    thread_local Converters mine;
    const auto found = mine.open_.find(encoding);
    if (found == mine.open_.end()) return mine.Open(encoding);
    if (found->second != kNone) (void)iconv(found->second, nullptr, nullptr, nullptr, nullptr);
    return found->second;
  }

  ~Converters() { CloseAll(); }

 private:
  static constexpr size_t kKeptMax = 16;  // the content names encodings, and it may name many

  /// The C library loads and unloads under a lock of its own, which the thread sanitizer cannot see.
  static base::Mutex& LoadMutex() {
    static auto* mutex = new base::Mutex;  // never freed: threads may end after main
    return *mutex;
  }

  iconv_t Open(const std::string& encoding) {
    if (open_.size() >= kKeptMax) CloseAll();
    const base::MutexLock guard(LoadMutex());
    return open_[encoding] = iconv_open("UTF-8", encoding.c_str());
  }

  void CloseAll() {
    const base::MutexLock guard(LoadMutex());
    for (const auto& [name, converter] : open_) {
      if (converter != kNone) (void)iconv_close(converter);
    }
    open_.clear();
  }

  std::map<std::string, iconv_t> open_;
};

}  // namespace

bool ConvertToUtf8(std::string_view bytes, const std::string& encoding, bool cut, std::string& text) {
  const iconv_t converter = Converters::Get(encoding);
  if (converter == Converters::kNone) return false;
  text.clear();
  text.reserve(bytes.size() + bytes.size() / 2);
  size_t bad = 0;
  char* from = const_cast<char*>(bytes.data());
  size_t left = bytes.size();
  std::array<char, 16384> buffer;
  while (left > 0) {
    char* to = buffer.data();
    size_t room = buffer.size();
    const size_t result = iconv(converter, &from, &left, &to, &room);
    text.append(buffer.data(), buffer.size() - room);
    if (result != static_cast<size_t>(-1) || errno == E2BIG) continue;
    if (errno == EINVAL && cut) break;
    AppendUtf8(text, 0xFFFD);
    ++from;
    --left;
    if (++bad * 100 > bytes.size()) return false;
  }
  return true;
}

void HoldConverter(const char* from, const char* to) {
  static auto* held = new std::vector<iconv_t>;  // never freed
  held->push_back(iconv_open(to, from));
}

void LoadConverters() {
  static constexpr const char* kInUse[] = {
      "WINDOWS-1250", "WINDOWS-1251", "WINDOWS-1252", "WINDOWS-1253", "WINDOWS-1254", "WINDOWS-1255", "WINDOWS-1256",
      "WINDOWS-1257", "WINDOWS-1258", "WINDOWS-874",  "ISO-8859-2",   "ISO-8859-3",   "ISO-8859-4",   "ISO-8859-5",
      "ISO-8859-6",   "ISO-8859-7",   "ISO-8859-8",   "ISO-8859-10",  "ISO-8859-13",  "ISO-8859-15",  "ISO-8859-16",
      "KOI8-U",       "IBM850",       "IBM852",       "IBM855",       "IBM866",       "MACINTOSH",    "MAC-CYRILLIC",
      "GB18030",      "CP932",        "EUC-JP",       "ISO-2022-JP",  "UHC",          "ISO-2022-KR",  "JOHAB",
      "BIG5-HKSCS",   "EUC-TW"};
  for (const char* encoding : kInUse) HoldConverter(encoding, "UTF-8");
}

}  // namespace ferrox::extract
