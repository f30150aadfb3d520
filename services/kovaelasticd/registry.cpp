#include "services/kovaelasticd/registry.h"

#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/scope_exit.h"
#include "services/kovaelasticd/index_files.h"
#include "services/kovaelasticd/sqlite_store.h"

namespace ferrox::engine {

namespace {

std::string NoSuchIndex(const std::string& id) {
  return "there is no index \"" + id + "\"; 'fileindexctl folder add' makes that of a share";
}

}  // namespace

Registry::Registry(const std::string& state_folder) : file_path_(state_folder + "/indices.json") { Load(); }

Registry::~Registry() = default;

void Registry::Load() {
  Json::Value file;
  const bool readable = !IsFileExist(file_path_) || fromFile(file, file_path_);
  FERROX_FAIL_IF(!readable || !IsJsonObject(file), Error::kInternal,
                 file_path_ + " is damaged; remove it and create the indices again");
  for (const std::string& id : file.getMemberNames()) {
    const Json::Value& stored = file[id];
    const auto entry = std::make_shared<Entry>();
    GetJsonValue(entry->path, stored, "path", true);
    GetJsonValue(entry->paused, stored, "paused", false);
    GetJsonValue(entry->mappings, stored, "mappings", false);
    GetJsonValue(entry->next_id, stored, "next_id", false);
    GetJsonValue(entry->next_path, stored, "next_path", false);
    entry->schema = std::make_shared<Schema>(entry->mappings);
    entries_[id] = entry;
  }
  for (const std::string& id : file.getMemberNames()) FinishMove(id);
}

void Registry::Save() {
  Json::Value file(Json::objectValue);
  for (const auto& [id, entry] : entries_) {
    Json::Value& stored = file[id];
    stored["path"] = entry->path;
    stored["paused"] = entry->paused;
    stored["mappings"] = entry->mappings;
    if (entry->next_id.empty()) continue;
    stored["next_id"] = entry->next_id;
    stored["next_path"] = entry->next_path;
  }
  FERROX_FAIL_IF(!toFile(file, file_path_), Error::kEngineStorage,
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
  entry.index = std::make_shared<Index>(std::move(store), MarkerFile(path));
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
    if (IsFileExist(IndexFile(path))) return;
    CloseEntry(entry);  // its file was removed behind our back
    MakeIndexFolder(path);
    OpenEntry(entry, path, true);
    return;
  }
  RefuseTaken(id, path, nullptr);
  const auto entry = std::make_shared<Entry>();
  entry->path = path;
  entry->mappings = mappings;
  entry->schema = std::make_shared<Schema>(mappings);
  MakeIndexFolder(path);
  OpenEntry(*entry, path, true);
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
  // What a killed engine has left beside the file goes into it first.
  if (at_source && IsFileExist(IndexFile(entry->path) + "-wal")) OpenEntry(*entry, entry->path, false);
  CloseEntry(*entry);
  {
    const std::lock_guard<std::mutex> guard(mutex_);
    entry->next_id = to_id;
    entry->next_path = to_path;
    Save();  // a restart in the midst of it finishes what was begun
  }
  const ScopeExit finish([this, &id] { FinishMove(id); });
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
    FERROX_FAIL_IF(entry->paused, Error::kEngineIndexPaused,
                   "the index \"" + id + "\" is paused; 'fileindexctl share resume' goes on with it");
    path = entry->path;
  }
  OpenEntry(*entry, path, false);
  return {id, entry->index, entry->schema};
}

std::vector<Registry::Listed> Registry::List() {
  const std::lock_guard<std::mutex> guard(mutex_);
  std::vector<Listed> listed;
  for (const auto& [id, entry] : entries_) listed.push_back({id, entry->path, entry->paused});
  return listed;
}

}  // namespace ferrox::engine
