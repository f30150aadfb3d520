#pragma once

#include <cstdint>
#include <span>
#include <string>

#include "services/kovacontentextractd/readers/reader.h"

/// Cameras write EXIF, a TIFF file of numbered tags; news agencies IPTC, numbered records; programs XMP, properties in
/// XML. A file may have all three, saying the same or not. The library finds and parses them in each container; what is
/// decided here is which of them fills a field.
namespace ferrox::extract {

/// Which key of the library fills which field, and how.
struct PhotoRow {
  enum Kind : uint8_t { kText, kInteger, kNumber, kShown };

  const char* key;
  const char* field;
  Kind kind = kText;  ///< kShown: in the words that the library has for the number
};

// The rows of each source. Of several rows for a field that is no list, the first one that the file has counts.
std::span<const PhotoRow> ExifRows();
std::span<const PhotoRow> IptcRows();
std::span<const PhotoRow> XmpRows();
/// What programs copy out of EXIF into XMP, and in some files is all that is left of it.
std::span<const PhotoRow> CopiedRows();

/// Collects fields so that of several sources the first one counts, and lists are joined.
class PhotoFields {
 public:
  explicit PhotoFields(Findings& findings) : findings_(findings) {}

  /// Sets the field unless an earlier source has, or adds to it where it is a list. An empty text does nothing.
  void Add(const char* field, const std::string& text);
  /// The value that counts; "" where there is none, and for a list.
  std::string Value(const char* field) const { return values_.get(field, "").asString(); }

 private:
  Findings& findings_;
  Json::Value values_;
};

}  // namespace ferrox::extract
