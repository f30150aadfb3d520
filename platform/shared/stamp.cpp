#include <kova/content_extract.h>

#include "base/file_stamp.h"

namespace KOVA::CONTENT_EXTRACT {

using base::FileStamp;

std::string Stamp(const struct stat& status) { return FileStamp::Of(status).Text(); }

bool SameFile(const std::string& stamp, const std::string& other) {
  const auto one = FileStamp::Parse(stamp);
  const auto two = FileStamp::Parse(other);
  return one.has_value() && two.has_value() && one->SameFile(*two);
}

bool SameContent(const std::string& stamp, const std::string& other) {
  const auto one = FileStamp::Parse(stamp);
  const auto two = FileStamp::Parse(other);
  return one.has_value() && two.has_value() && one->SameContent(*two);
}

}  // namespace KOVA::CONTENT_EXTRACT
