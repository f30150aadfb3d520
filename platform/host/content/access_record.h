#pragma once

#include <sys/stat.h>

#include <string>

namespace kova::content {

/// Whom a file belongs to and who may do what with it, as `lstat` or `statx` tell.
struct Rights {
  uid_t owner = 0;
  gid_t group = 0;
  mode_t mode = 0;  ///< with the type
  dev_t device = 0;
};

/// The "_KOVAAccess" of kova/content_extract.h of the file at `path`, which has these rights. At most one call of the
/// system, for the ACL.
std::string AccessRecord(const std::string& path, const Rights& rights);
/// The same with the rights that the file has now; "" when it cannot be examined.
std::string AccessRecord(const std::string& path);

}  // namespace kova::content
