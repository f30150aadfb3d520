#include "services/kovaelasticd/registry.h"

#include <syslog.h>

#include <cerrno>

#include "base/scope_exit.h"
#include "common/clock.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "services/kovaelasticd/index_files.h"
#include "services/kovaelasticd/sqlite_db.h"
#include "services/kovaelasticd/sqlite_store.h"

namespace ferrox::engine {

namespace {

std::string NoSuchIndex(const std::string& id) {
  return "there is no index \"" + id + "\"; 'fileindexctl folder add' makes that of a share";
}

std::string PausedIndex(const std::string& id) {
  return "the index \"" + id + "\" is paused; 'fileindexctl share resume' goes on with it";
}

std::string CopyOf(const std::string& file_path) { return file_path + ".copy"; }

}  // namespace

Registry::Registry(const std::string& state_folder) : file_path_(state_folder + "/indices.json") { Load(); }

Registry::~Registry() = default;

/// Where neither the file nor its copy can be used, all indices are unknown: they are as they were in their folders,
/// and found again when they are created there.
void Registry::Load() {
  const bool there = IsFileExist(file_path_);
  if (!Read(file_path_, entries_)) {
    if (there) {
      Log(LOG_ERR, "%s is damaged; it is set aside and made anew", file_path_.c_str());
      SetAside(file_path_, Clock::Get().Now());
    }
    if (!Read(CopyOf(file_path_), entries_)) entries_.clear();
    if (there || !entries_.empty()) Save();
  }
  std::vector<std::string> ids;
  for (const auto& [id, entry] : entries_) ids.push_back(id);
  for (const std::string& id : ids) FinishMove(id);
}

/// False for a file that is missing or damaged. @throws Error kInternal for one that is neither and cannot be read.
bool Registry::Read(const std::string& path, Entries& entries) {
  std::string text;
  Json::Value file;
  if (!ReadWholeFile(path, text)) {
    FERROX_FAIL_IF(errno != ENOENT, Error::kInternal,
                   path + " cannot be read: " + ErrnoText() + "; it must be a file that the engine's user may read");
    return false;
  }
  entries.clear();
  if (!fromString(file, text) || !file.isObject()) return false;
  try {
    for (const std::string& id : file.getMemberNames()) {
      const Json::Value& stored = file[id];
      const auto entry = std::make_shared<Entry>();
      GetJsonValue(entry->path, stored, "path", true);
      if (entry->path.empty() || entry->path[0] != '/') throw Error(Error::kBadArgument, "the folder " + entry->path);
      GetJsonValue(entry->paused, stored, "paused", false);
      GetJsonValue(entry->mappings, stored, "mappings", false);
      GetJsonValue(entry->next_id, stored, "next_id", false);
      GetJsonValue(entry->next_path, stored, "next_path", false);
      GetJsonValue(entry->mount_point, stored, "mount_point", false);
      Json::Value rebuild;
      GetJsonValue(rebuild, stored, "rebuild", false);
      entry->rebuild = RebuildState::FromJson(rebuild);
      entry->schema = std::make_shared<Schema>(entry->mappings);
      entries[id] = entry;
    }
  } catch (const Error& error) {
    Log(LOG_ERR, "%s holds what no engine wrote: %s", path.c_str(), error.what());
    return false;
  }
  return true;
}

void Registry::Save() {
  Json::Value file(Json::objectValue);
  for (const auto& [id, entry] : entries_) {
    Json::Value& stored = file[id];
    stored["path"] = entry->path;
    stored["paused"] = entry->paused;
    stored["mappings"] = entry->mappings;
    if (!entry->mount_point.empty()) stored["mount_point"] = entry->mount_point;
    const Json::Value rebuild = entry->rebuild.ToJson();
    if (!rebuild.isNull()) stored["rebuild"] = rebuild;
    if (entry->next_id.empty()) continue;
    stored["next_id"] = entry->next_id;
    stored["next_path"] = entry->next_path;
  }
  FERROX_FAIL_IF(!toFile(file, CopyOf(file_path_)) || !toFile(file, file_path_), Error::kEngineStorage,
                 "cannot write " + file_path_ + ": " + ErrnoText() + "; free space and try again");
}

Registry::EntryPtr Registry::Find(const std::string& id) {
  const std::lock_guard<std::mutex> guard(mutex_);
  const auto found = entries_.find(id);
  FERROX_FAIL_IF(found == entries_.end(), Error::kEngineNoSuchIndex, NoSuchIndex(id));
  return found->second;
}

void Registry::OpenEntry(Entry& entry, const std::string& path, bool create) {
  if (entry.index != nullptr) return;
  auto store = std::make_unique<SqliteStore>(IndexFile(path), create, entry.schema);
  entry.index = std::make_shared<Index>(std::move(store), MarkerFile(path), Index::kAutoCommitAfter,
                                        [this, damaged = entry.damaged] {
                                          *damaged = true;
                                          any_damaged_ = true;
                                        });
}

/// Opens the index, whatever has become of its file. With the entry's open_mutex, like all that follows from here.
void Registry::OpenOrHeal(Entry& entry, const std::string& path, bool create) {
  if (NeedsHealing(entry, path)) return Heal(entry, path);
  try {
    OpenEntry(entry, path, create);
  } catch (const IndexDamaged&) {
    *entry.damaged = true;
    return Heal(entry, path);
  }
  NoteMountPoint(entry, path);
}

bool Registry::NeedsHealing(const Entry& entry, const std::string& path) {
  return *entry.damaged || entry.rebuild.Unmade() || IsIndexFileLost(path);
}

void Registry::Heal(Entry& entry, const std::string& path) {
  if (entry.rebuild.Unmade()) return FinishMaking(entry, path);
  const bool lost = IsIndexFileLost(path);
  const std::string mounted = MountPointOf(path);
  const bool away = entry.mount_point.empty() ? !IsDirExist(path, true) : entry.mount_point != mounted;
  FERROX_FAIL_IF(lost && away, Error::kEngineStorage,
                 "the index in " + path + " is not there, and its volume" +
                     (entry.mount_point.empty() ? "" : " (" + entry.mount_point + ")") +
                     " seems not to be mounted; it is used again when it is back");
  FERROX_FAIL_IF(!entry.rebuild.MayBegin(Clock::Get().Now()), Error::kEngineStorage,
                 "the index in " + path + " was " + (lost ? "lost" : "damaged") +
                     " again, after it was made anew twice within a day; look at the disk first, then "
                     "'fileindexctl rebuild' makes it anew");
  MakeAnew(entry, path, lost ? "its file was missing" : "its file was damaged", false);
}

/// The state is on the disk before the new file is: an empty index never looks like one that is complete.
void Registry::MakeAnew(Entry& entry, const std::string& path, const std::string& reason, bool asked) {
  const int64_t now = Clock::Get().Now();
  Log(LOG_WARNING, "the index in %s is made anew: %s", path.c_str(), reason.c_str());
  CloseEntry(entry);
  MakeIndexFolder(path);
  SetAsideIndexFiles(path, now);
  *entry.damaged = false;
  {
    const std::lock_guard<std::mutex> guard(mutex_);
    entry.rebuild.Begin(now, reason, asked);
    Save();
  }
  FinishMaking(entry, path);
}

void Registry::FinishMaking(Entry& entry, const std::string& path) {
  MakeIndexFolder(path);
  OpenEntry(entry, path, true);
  const std::lock_guard<std::mutex> guard(mutex_);
  entry.mount_point = MountPointOf(path);
  entry.rebuild.SetMade(true);
  try {
    Save();
  } catch (const Error&) {
    entry.rebuild.SetMade(false);
    throw;
  }
}

void Registry::NoteMountPoint(Entry& entry, const std::string& path) {
  if (!entry.mount_point.empty()) return;
  const std::lock_guard<std::mutex> guard(mutex_);
  entry.mount_point = MountPointOf(path);
  try {
    Save();
  } catch (const Error&) {
    entry.mount_point.clear();  // logged where it arose; tried again when the index is next asked for
  }
}

void Registry::Rebuild(const std::string& id) {
  const std::lock_guard<std::mutex> change(change_mutex_);
  const EntryPtr entry = Find(id);
  const std::lock_guard<std::mutex> opening(entry->open_mutex);
  FERROX_FAIL_IF(entry->paused, Error::kEngineIndexPaused, PausedIndex(id));
  const bool away = !entry->mount_point.empty() && entry->mount_point != MountPointOf(entry->path);
  FERROX_FAIL_IF(away, Error::kEngineStorage,
                 "the volume of the index in " + entry->path + " is not mounted at " + entry->mount_point);
  MakeAnew(*entry, entry->path, "somebody asked for it", true);
}

void Registry::EndRebuild(const std::string& id, int64_t since) {
  const std::lock_guard<std::mutex> change(change_mutex_);
  const EntryPtr entry = Find(id);
  const std::lock_guard<std::mutex> opening(entry->open_mutex);
  if (since == 0 || entry->rebuild.Since() != since || *entry->damaged) return;
  {
    const std::lock_guard<std::mutex> guard(mutex_);
    const RebuildState before = entry->rebuild;
    entry->rebuild.End();
    try {
      Save();
    } catch (const Error&) {
      entry->rebuild = before;
      throw;
    }
  }
  RemoveSetAside(IndexFile(entry->path));
}

void Registry::HealDamaged() {
  if (!any_damaged_.exchange(false)) return;
  for (const Listed& listed : List()) {
    try {
      const EntryPtr entry = Find(listed.id);
      if (*entry->damaged) (void)Open(listed.id);
    } catch (const Error&) {
      // Logged where it arose; whoever asks for the index next is told.
    }
  }
}

void Registry::CloseEntry(Entry& entry) {
  if (entry.index == nullptr) return;
  entry.index->Close();
  entry.index.reset();
}

void Registry::RefuseTaken(const std::string& id, const std::string& path, const Entry* except) {
  const std::lock_guard<std::mutex> guard(mutex_);
  for (const auto& [other_id, other] : entries_) {
    if (other.get() == except) continue;
    FERROX_FAIL_IF(other_id == id, Error::kEngineIndexExists,
                   "there is an index \"" + id + "\" already, in " + other->path + "; delete it first");
    FERROX_FAIL_IF(other->path == path, Error::kEngineIndexExists,
                   "the folder " + path + " holds the index \"" + other_id + "\"; choose another");
  }
}

void Registry::Create(const std::string& id, const std::string& path, const Json::Value& mappings) {
  const std::lock_guard<std::mutex> change(change_mutex_);
  const auto known = entries_.find(id);
  if (known != entries_.end() && known->second->path == path) {
    Entry& entry = *known->second;
    const std::lock_guard<std::mutex> opening(entry.open_mutex);
    SetPaused(entry, false);
    return OpenOrHeal(entry, path, false);
  }
  RefuseTaken(id, path, nullptr);
  const auto entry = std::make_shared<Entry>();
  entry->path = path;
  entry->mappings = mappings;
  entry->schema = std::make_shared<Schema>(mappings);
  MakeIndexFolder(path);
  entry->mount_point = MountPointOf(path);
  try {
    OpenEntry(*entry, path, true);
  } catch (const IndexDamaged&) {
    // Left by an index of before. Who creates an index fills it.
    SetAsideIndexFiles(path, Clock::Get().Now());
    OpenEntry(*entry, path, true);
  }
  const std::lock_guard<std::mutex> guard(mutex_);
  entries_[id] = entry;
  try {
    Save();
  } catch (const Error&) {
    entries_.erase(id);
    throw;
  }
}

void Registry::Pause(const std::string& id) {
  const std::lock_guard<std::mutex> change(change_mutex_);
  const EntryPtr entry = Find(id);
  const std::lock_guard<std::mutex> opening(entry->open_mutex);
  CloseEntry(*entry);
  SetPaused(*entry, true);
}

void Registry::Resume(const std::string& id) {
  const std::lock_guard<std::mutex> change(change_mutex_);
  SetPaused(*Find(id), false);
}

void Registry::SetPaused(Entry& entry, bool paused) {
  const std::lock_guard<std::mutex> guard(mutex_);
  if (entry.paused == paused) return;
  entry.paused = paused;
  Save();
}

void Registry::Delete(const std::string& id) {
  const std::lock_guard<std::mutex> change(change_mutex_);
  const EntryPtr entry = Find(id);
  const std::lock_guard<std::mutex> opening(entry->open_mutex);
  {
    const std::lock_guard<std::mutex> guard(mutex_);
    entries_.erase(id);
    Save();
  }
  CloseEntry(*entry);
  RemoveIndexFiles(entry->path);
}

void Registry::Move(const std::string& id, const std::string& new_id, const std::string& new_path) {
  const std::lock_guard<std::mutex> change(change_mutex_);
  const EntryPtr entry = Find(id);
  const std::string to_id = new_id.empty() ? id : new_id;
  const std::string to_path = new_path.empty() ? entry->path : new_path;
  if (to_id == id && to_path == entry->path) return;
  RefuseTaken(to_id, to_path, entry.get());
  const std::lock_guard<std::mutex> opening(entry->open_mutex);
  const bool at_target = IsFileExist(IndexFile(to_path));
  const bool at_source = IsFileExist(IndexFile(entry->path));
  FERROX_FAIL_IF(to_path != entry->path && at_target && at_source, Error::kEngineIndexExists,
                 "there is another index in " + to_path + "; remove it first");
  RemoveSetAside(IndexFile(entry->path));
  // What a killed engine has left beside the file goes into it first.
  if (at_source && IsFileExist(IndexFile(entry->path) + "-wal")) OpenEntry(*entry, entry->path, false);
  CloseEntry(*entry);
  {
    const std::lock_guard<std::mutex> guard(mutex_);
    entry->next_id = to_id;
    entry->next_path = to_path;
    Save();  // a restart in the midst of it finishes what was begun
  }
  const base::ScopeExit finish([this, &id] { FinishMove(id); });
  if (to_path != entry->path && at_source) MoveIndexFiles(entry->path, to_path);
}

/// Completes a move whose files are in the new place, and forgets one whose files are still in the old.
void Registry::FinishMove(const std::string& id) {
  const std::lock_guard<std::mutex> guard(mutex_);
  auto node = entries_.extract(id);
  Entry& entry = *node.mapped();
  const bool moving = !entry.next_id.empty();
  if (moving && (entry.path == entry.next_path || IsFileExist(IndexFile(entry.next_path)) ||
                 !IsFileExist(IndexFile(entry.path)))) {
    node.key() = entry.next_id;
    entry.path = entry.next_path;
  }
  entry.next_id.clear();
  entry.next_path.clear();
  entries_.insert(std::move(node));
  if (!moving) return;
  try {
    Save();
  } catch (const Error&) {
    // Logged where it arose; the next start finds the files where they are now.
  }
}

Registry::OpenIndex Registry::Open(const std::string& id) {
  const EntryPtr entry = Find(id);
  const std::lock_guard<std::mutex> opening(entry->open_mutex);
  std::string path;
  {
    const std::lock_guard<std::mutex> guard(mutex_);
    const auto still = entries_.find(id);
    FERROX_FAIL_IF(still == entries_.end() || still->second != entry, Error::kEngineNoSuchIndex, NoSuchIndex(id));
    FERROX_FAIL_IF(entry->paused, Error::kEngineIndexPaused, PausedIndex(id));
    path = entry->path;
  }
  OpenOrHeal(*entry, path, false);
  return {id, entry->index, entry->schema, entry->rebuild};
}

std::vector<Registry::Listed> Registry::List() {
  const std::lock_guard<std::mutex> guard(mutex_);
  std::vector<Listed> listed;
  for (const auto& [id, entry] : entries_) listed.push_back({id, entry->path, entry->paused, entry->rebuild});
  return listed;
}

}  // namespace ferrox::engine
