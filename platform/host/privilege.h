#pragma once

#include <string>

namespace kova::host {

/// What the named user may do with the folder or file at `path`, by its mode bits and access control list, as a mask of
/// KOVA_PERM_*; whether the folders above let the user through is not asked. Below 0, with the failure recorded, when
/// the user or the path is unknown.
int UserPermissions(const std::string& user, const std::string& path);

}  // namespace kova::host
