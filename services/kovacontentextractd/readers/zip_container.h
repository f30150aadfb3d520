#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/reader.h"

struct zip;

namespace ferrox::extract {

/// The members of a ZIP file, unpacked as they are read and within the limits: those of a member, and the expansion of
/// all that is unpacked together, whether or not members share their packed bytes. What goes wrong is said to the
/// findings, and ends the member. A "zip bomb" thus costs what Limits allow: for a small file 1 MiB, else 100 bytes for
/// each packed one, and never more than 256 MiB.
class ZipContainer {
 public:
  /// Reads the list of members at the end of the file; fails with "damaged" when there is none.
  ZipContainer(const Source& source, Findings& findings);
  ~ZipContainer();
  ZipContainer(const ZipContainer&) = delete;
  ZipContainer& operator=(const ZipContainer&) = delete;

  bool IsOpen() const { return archive_ != nullptr; }
  bool Has(std::string_view name) const;
  /// The member `name`, the first one where several have it; null when there is none, it is encrypted or in an unknown
  /// packing, and after a limit was reached. Members may not outlive the container.
  std::unique_ptr<ByteSource> Open(std::string_view name);
  /// Up to `limit_bytes` of a small member; empty when it cannot be read.
  std::string ReadMember(std::string_view name, size_t limit_bytes);
  /// The names that begin and end so, those with numbers in them in the order of their numbers; at most `limit`.
  std::vector<std::string> Names(std::string_view begin, std::string_view end, size_t limit = 10000) const;
  /// Gives all names in the file's order to `add`, until it returns false: the bytes that the file has, and the same in
  /// UTF-8, taken from the code page of DOS where it is not that.
  void EachName(const std::function<bool(const char* bytes, const char* utf8)>& add) const;

 private:
  friend class ZipMember;
  /// The number of a member; -1 when there is none. Some programs write names in another case, or as Windows does.
  int64_t Locate(std::string_view name) const;

  /// Whether `bytes` more may be unpacked.
  bool Spend(uint64_t bytes);

  Findings& findings_;
  uint64_t file_bytes_;          ///< of the whole container
  uint64_t packed_bytes_ = 0;    ///< of the members opened so far
  uint64_t unpacked_bytes_ = 0;  ///< of what was read of them
  bool exhausted_ = false;
  struct zip* archive_ = nullptr;
};

}  // namespace ferrox::extract
