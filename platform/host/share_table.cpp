#include "platform/host/share_table.h"

#include <syslog.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstring>

#include <json/value.h>
#include <json/writer.h>

#include <kova/error.h>
#include <kova/instance.h>

#include "base/mutex.h"
#include "platform/host/files.h"
#include "platform/host/json_members.h"
#include "platform/host/log.h"
#include "platform/host/samba_shares.h"
#include "platform/host/share_rules.h"
#include "platform/host/stat_cache.h"
#include "platform/shared/failure.h"

namespace kova::host {

namespace {

StatCache<ShareTable>& Cache() {
  static auto* cache = new StatCache<ShareTable>;  // never freed: look-ups may come until the very end of a process
  return *cache;
}

/// What is wrong with a list of users; empty when nothing is. A group of the table is one of the name service: only
/// Samba has netgroups.
std::string CheckUserNames(std::vector<std::string>& names) {
  for (std::string& name : names) {
    const std::string problem = UserNameProblem(name);
    if (!problem.empty()) return problem;
    if (name.front() == '@') name.front() = '+';
  }
  return {};
}

/// What is wrong with one element of the table; empty when it was read.
std::string ReadEntry(const Json::Value& object, ShareEntry& entry) {
  if (!object.isObject()) return "is not an object";
  const bool read = ReadMember(object, "name", entry.name) && ReadMember(object, "path", entry.path) &&
                    ReadMember(object, "recycle", entry.recycle) && ReadMember(object, "encrypted", entry.encrypted) &&
                    ReadMember(object, "locked", entry.locked) && ReadMember(object, "read_only", entry.read_only) &&
                    ReadMember(object, "hide_unreadable", entry.hide_unreadable) &&
                    ReadMember(object, "ftp_privilege", entry.ftp_privilege) &&
                    ReadMember(object, "valid_users", entry.users.valid) &&
                    ReadMember(object, "invalid_users", entry.users.invalid);
  if (!read) return "has a member of the wrong type";
  std::string problem = ReadNames(object, entry.names);
  if (!problem.empty()) return problem;
  for (std::vector<std::string>* names : {&entry.users.valid, &entry.users.invalid}) {
    problem = CheckUserNames(*names);
    if (!problem.empty()) return "has a list of users that " + problem;
  }
  while (entry.path.size() > 1 && entry.path.back() == '/') entry.path.pop_back();
  problem = ShareTextProblem(entry.name, entry.path);
  return problem.empty() ? problem : "is not valid: " + problem;
}

Json::Value ToJson(const ShareEntry& entry) {
  const ShareEntry usual;
  Json::Value object(Json::objectValue);
  object["name"] = entry.name;
  object["path"] = entry.path;
  if (!entry.recycle.empty()) object["recycle"] = entry.recycle;
  if (entry.encrypted) object["encrypted"] = true;
  if (entry.locked) object["locked"] = true;
  if (entry.read_only) object["read_only"] = true;
  if (entry.hide_unreadable) object["hide_unreadable"] = true;
  if (entry.ftp_privilege != usual.ftp_privilege) object["ftp_privilege"] = entry.ftp_privilege;
  return object;
}

/// Keeps other processes from changing the table. The lock file stays.
class TableLock {
 public:
  TableLock() : lock_(ShareTablePath() + ".lock") {
    if (lock_.Problem() != 0) throw ShareTableError(lock_.ProblemText());
  }

 private:
  ExclusiveLock lock_;
};

std::string TableProblem(const std::string& table_path, const std::string& problem) {
  return "the share table " + table_path + " " + problem + "; correct it, or move it away to start with an empty one";
}

/// The table as it stands in the file, checked as a whole.
Json::Value ReadChecked() {
  const ShareTable table = ShareTable::Load(ShareTablePath());
  if (!table.Problem().empty()) throw ShareTableError(table.Problem());
  Json::Value value;
  (void)ReadJsonFile(ShareTablePath(), value);
  return value.isNull() ? Json::Value(Json::arrayValue) : value;
}

/// @throws ShareTableError when the share cannot be one, whatever the table holds.
void CheckShare(const ShareEntry& share) {
  std::string problem = ShareTextProblem(share.name, share.path);
  if (problem.empty()) problem = ShareFolderProblem(share);
  if (!problem.empty()) throw ShareTableError(problem);
}

/// @throws ShareTableError when another share of the table than the one named `replaced` has the name or the path.
void CheckBeside(const Json::Value& table, const ShareEntry& share, const std::string& replaced) {
  for (const Json::Value& other : table) {
    const std::string other_name = other["name"].asString(), other_path = other["path"].asString();
    if (other_name == replaced) continue;
    if (other_name == share.name) {
      throw ShareTableError("there is a share \"" + share.name + "\" already, at " + other_path +
                            "; remove it first, or give this folder another name");
    }
    if (other_path == share.path) throw ShareTableError(share.path + " is a share already; nothing to add");
  }
}

/// The table and Samba's shares as one, made anew when one of them is.
std::shared_ptr<const ShareTable> WithSamba(const std::shared_ptr<const ShareTable>& own) {
  struct Made {
    base::Mutex mutex;
    std::shared_ptr<const ShareTable> own BASE_GUARDED_BY(mutex), both BASE_GUARDED_BY(mutex);
    std::shared_ptr<const std::vector<ShareEntry>> samba BASE_GUARDED_BY(mutex);
  };
  static auto* made = new Made;  // never freed, like the table
  const std::shared_ptr<const std::vector<ShareEntry>> samba = SambaShares();
  if (samba == nullptr || !own->Problem().empty()) return own;
  const base::MutexLock lock(made->mutex);
  if (made->own != own || made->samba != samba) {
    made->both = std::make_shared<const ShareTable>(own->With(*samba));
    made->own = own;
    made->samba = samba;
  }
  return made->both;
}

[[noreturn]] void ThrowNoSuchShare(const std::string& name) {
  const std::shared_ptr<const std::vector<ShareEntry>> samba = SambaShares();
  const bool sambas = samba != nullptr && std::any_of(samba->begin(), samba->end(),
                                                      [&](const ShareEntry& share) { return share.name == name; });
  if (sambas) throw ShareTableError("share \"" + name + "\" stands in Samba's configuration; change it there");
  throw ShareTableError("there is no share \"" + name + "\"; the list of shares names those there are");
}

void Write(const Json::Value& table) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "  ";
  builder["emitUTF8"] = true;
  const bool written = ReplaceFile(ShareTablePath(), Json::writeString(builder, table) + "\n", 0644);
  if (!written) throw ShareTableError("cannot write " + ShareTablePath() + ": " + strerror(errno));
  Cache().Forget();
}

}  // namespace

std::string ShareTablePath() { return InstanceRoot() + "/etc/kova/shares.json"; }

ShareTable ShareTable::Load(const std::string& table_path) {
  ShareTable table;
  Json::Value value;
  std::string problem = ReadJsonFile(table_path, value);
  if (problem.empty() && !value.isNull() && !value.isArray()) problem = "is not an array";
  for (Json::ArrayIndex i = 0; problem.empty() && i < value.size(); ++i) {
    ShareEntry entry;
    problem = ReadEntry(value[i], entry);
    if (!problem.empty()) problem = "has an entry (number " + std::to_string(i + 1) + ") that " + problem;
    table.entries_.push_back(std::move(entry));
  }
  if (problem.empty()) problem = table.BuildIndex();
  if (!problem.empty()) {
    table = ShareTable();
    table.problem_ = TableProblem(table_path, problem);
  }
  return table;
}

std::string ShareTable::BuildIndex() {
  std::sort(entries_.begin(), entries_.end(), [](const ShareEntry& a, const ShareEntry& b) { return a.name < b.name; });
  by_name_.clear();
  by_path_.clear();
  for (size_t i = 0; i < entries_.size(); ++i) {
    const ShareEntry& entry = entries_[i];
    if (!by_name_.emplace(entry.name, i).second) return "has two shares named \"" + entry.name + "\"";
    if (!by_path_.emplace(entry.path, i).second) return "has two shares at " + entry.path;
  }
  return {};
}

ShareTable ShareTable::With(const std::vector<ShareEntry>& samba) const {
  ShareTable both = *this;
  for (const ShareEntry& entry : samba) {
    const ShareEntry* own = ByName(entry.name);
    if (own == nullptr) {
      both.entries_.push_back(entry);
      both.entries_.back().from_samba = true;
    } else if (own->path != entry.path) {
      LogChange(LOG_WARNING, "share " + entry.name,
                "share \"" + entry.name + "\" is at " + own->path + " by " + ShareTablePath() + " and at " +
                    entry.path + " by Samba's configuration: the first counts");
    }
  }
  (void)both.BuildIndex();  // a share's path ends in its name: with the names the paths differ too
  return both;
}

std::shared_ptr<const ShareTable> ShareTable::Current() {
  std::shared_ptr<const ShareTable> table = WithSamba(Cache().Get(ShareTablePath(), &ShareTable::Load));
  static std::atomic<bool> damaged{false};
  constexpr char kSubject[] = "share table";
  if (table->Problem().empty()) {
    if (damaged.exchange(false)) LogChange(LOG_INFO, kSubject, "the share table can be used again");
    return table;
  }
  damaged = true;
  LogChange(LOG_ERR, kSubject, table->Problem());
  (void)KOVA_FAIL(KOVA_ERR_BAD_CONFIGURATION);
  return nullptr;
}

const ShareEntry* ShareTable::ByName(const std::string& name) const {
  const auto found = by_name_.find(name);
  return found == by_name_.end() ? nullptr : &entries_[found->second];
}

const ShareEntry* ShareTable::ByFullPath(const std::string& full_path) const {
  if (full_path.empty() || full_path.front() != '/' || by_path_.empty()) return nullptr;
  for (std::string path = full_path; !path.empty(); path.resize(path.rfind('/'))) {
    const auto found = by_path_.find(path);
    if (found != by_path_.end()) return &entries_[found->second];
  }
  return nullptr;
}

std::vector<ShareEntry> ListShares() {
  const std::shared_ptr<const ShareTable> table = WithSamba(Cache().Get(ShareTablePath(), &ShareTable::Load));
  if (!table->Problem().empty()) throw ShareTableError(table->Problem());
  return table->Entries();
}

void AddShare(const ShareEntry& share) {
  CheckShare(share);
  const TableLock lock;
  Json::Value table = ReadChecked();
  CheckBeside(table, share, {});
  table.append(ToJson(share));
  Write(table);
}

void RenameShare(const std::string& old_name, const std::string& new_name, const std::string& new_path) {
  const ShareEntry renamed = {new_name, new_path};
  CheckShare(renamed);
  const TableLock lock;
  Json::Value table = ReadChecked();
  CheckBeside(table, renamed, old_name);
  for (Json::Value& share : table) {
    if (share["name"].asString() != old_name) continue;
    share["name"] = new_name;
    share["path"] = new_path;
    return Write(table);
  }
  ThrowNoSuchShare(old_name);
}

void MoveShare(const std::string& name, const std::string& new_path) { RenameShare(name, name, new_path); }

void RemoveShare(const std::string& name) {
  const TableLock lock;
  const Json::Value table = ReadChecked();
  Json::Value rest(Json::arrayValue);
  for (const Json::Value& share : table) {
    if (share["name"].asString() != name) rest.append(share);
  }
  if (rest.size() == table.size()) ThrowNoSuchShare(name);
  Write(rest);
}

}  // namespace kova::host
