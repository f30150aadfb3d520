#pragma once

#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string>
#include <unordered_map>
#include <vector>

#include "platform/host/share_names.h"
#include "platform/host/share_users.h"

/// The host's shares: the JSON array in "/etc/kova/shares.json" below the instance's root. Each element is an object:
///   {"name": "photo", "path": "/volume1/photo", "recycle": "#recycle", "encrypted": false, "locked": false,
///    "read_only": false, "hide_unreadable": false, "ftp_privilege": 2, "valid_users": ["ann", "@staff"],
///    "invalid_users": [], "veto_files": "/.DS_Store/", "hide_files": ""}
/// "name" and "path" are required, the others are written when they differ from the values in ShareEntry. Other members
/// are kept. A missing file is an empty table.
namespace kova::host {

struct ShareEntry {
  std::string name;
  /// Absolute, without links; its last component is the name, since full paths are composed of both.
  std::string path;
  /// The recycle bin's folder at the top of the share, for example "#recycle"; empty: no recycle bin.
  std::string recycle = {};
  bool encrypted = false;
  bool locked = false;  ///< encrypted and closed now
  bool read_only = false;
  bool hide_unreadable = false;
  uint32_t ftp_privilege = 2;
  ShareUsers users = {};
  ShareNames names = {};
  /// Why the rights of its files do not tell who may read it, as far as its configuration shows; empty when they do.
  std::string foreign_rights = {};
  bool from_samba = false;  ///< read from Samba's configuration, not from the table
};

/// What is wrong, as one sentence that says what to do.
class __attribute__((visibility("default"))) ShareTableError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// Where the table of this instance is.
std::string ShareTablePath();

/// All shares in ascending order of their names, Samba's among them where the host's configuration asks for them; a
/// share of the table hides Samba's of the same name. @throws ShareTableError when the table cannot be used.
std::vector<ShareEntry> ListShares();

/// Adds a share. Shares may lie in one another: the deepest one then owns a path. Blocks while another process changes
/// the table. @throws ShareTableError when the share is not valid, exists, or the table cannot be read or written;
/// the table is then as it was.
void AddShare(const ShareEntry& share);

/// Gives a share another name, another folder or both, in one step; its other members stay. The folder under the new
/// path must be there already. @throws ShareTableError when there is no such share, when AddShare would refuse the new
/// name or path beside the other shares, as above.
void RenameShare(const std::string& old_name, const std::string& new_name, const std::string& new_path);

/// Gives a share another folder of the same name. @throws ShareTableError as RenameShare.
void MoveShare(const std::string& name, const std::string& new_path);

/// Takes a share out of the table; its folder stays. @throws ShareTableError when there is no such share, as above.
void RemoveShare(const std::string& name);

/// The table in memory, for the platform's own look-ups.
class ShareTable {
 public:
  /// The present table with Samba's shares, re-read when one of their files has changed; null, with the failure
  /// recorded, when the table cannot be used.
  static std::shared_ptr<const ShareTable> Current();

  const std::vector<ShareEntry>& Entries() const { return entries_; }
  const ShareEntry* ByName(const std::string& name) const;
  /// The deepest share that `full_path` lies in, on whole components; null when there is none.
  const ShareEntry* ByFullPath(const std::string& full_path) const;
  const std::string& Problem() const { return problem_; }

  static ShareTable Load(const std::string& table_path);
  /// The table with those of `samba` that it has not itself.
  ShareTable With(const std::vector<ShareEntry>& samba) const;

 private:
  /// Sorts the entries and finds them by name and path. What is wrong, or an empty text.
  std::string BuildIndex();

  std::vector<ShareEntry> entries_;
  std::unordered_map<std::string, size_t> by_name_;
  std::unordered_map<std::string, size_t> by_path_;
  std::string problem_;
};

}  // namespace kova::host
