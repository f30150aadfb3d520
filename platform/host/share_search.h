#pragma once

#include <string>
#include <vector>

#include <json/value.h>

namespace kova::host {

/// What the search engine is to know of a share (docs/formats/engine.md, "index_share").
struct ShareForSearch {
  std::string root;     ///< its folder
  std::string refused;  ///< why ordinary users may not search it, a sentence without its end; empty: they may
  /// For users for whom another program asks: {"valid_users": [NAME...], "invalid_users": [NAME...], "veto_files":
  /// [PATTERN...], "hide_files": [PATTERN...], "case_counts"?: true, "closed"?: reason}.
  Json::Value rules;
};

/// Looks a share up in the present table. Reads the table, Samba's shares where they have changed, and asks the file
/// system of the share's folder, which may hang. @return whether there is such a share, and the table can be read.
bool FindShareForSearch(const std::string& name, ShareForSearch& found);

/// The files that make the shares what they are, as the settings say now; more may be included by these. Not all need
/// be there, but their folders are.
std::vector<std::string> FilesOfShares();

/// Why a mounted file system does not tell by the rights of files who may read them, a sentence without its end; empty
/// when it does. `type` is one of KOVA_FS_*, `mounted_type` and `options` are those of the mount table.
std::string FileSystemRightsProblem(int type, const std::string& mounted_type, const std::string& options);

}  // namespace kova::host
