#include "services/kovacontentextractd/readers/mail_extent.h"

#include <algorithm>
#include <cstring>
#include <string_view>

#include "services/kovacontentextractd/readers/mapped_file.h"

namespace ferrox::extract {

namespace {

// Of one message.
constexpr int kHeaderLinesMax = 20000;
constexpr uint64_t kHeaderBytesMax = 1U << 20;
constexpr int kBordersMax = 10000;  ///< lines that may begin a part

/// Counts, line by line, what the library would keep of the present message.
class Extent {
 public:
  explicit Extent(bool is_box) : is_box_(is_box) {}

  /// Whether `line`, without its end, is still of a message that can be read.
  bool Take(std::string_view line) {
    if (is_box_ && line.starts_with("From ")) *this = Extent(true);
    const bool blank = line.empty() || line == "\r";
    if (blank) {
      in_header_ = false;
    } else if (line.starts_with("--")) {
      ++borders_;
      in_header_ = true;
    } else if (in_header_) {
      ++header_lines_;
      header_bytes_ += line.size();
    }
    return header_lines_ <= kHeaderLinesMax && header_bytes_ <= kHeaderBytesMax && borders_ <= kBordersMax;
  }

 private:
  bool is_box_;
  bool in_header_ = true;
  int header_lines_ = 0;
  uint64_t header_bytes_ = 0;
  int borders_ = 0;
};

}  // namespace

uint64_t MailExtent(const Source& source, bool is_box) {
  const MappedFile file(source);
  if (file.Data() == nullptr) return 0;
  std::string_view rest(reinterpret_cast<const char*>(file.Data()), file.Size());
  for (Extent extent(is_box); !rest.empty();) {
    const size_t end = std::min(rest.find('\n'), rest.size());
    if (!extent.Take(rest.substr(0, end))) break;
    rest.remove_prefix(std::min(end + 1, rest.size()));
  }
  return file.Size() - rest.size();
}

}  // namespace ferrox::extract
