#define FERROX_SOURCE "registry"

#include "services/kovaelasticd/indices/index_table.h"

#include <syslog.h>

#include <cerrno>
#include <utility>
#include <vector>

#include "common/clock.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "services/kovaelasticd/store/index_files.h"

namespace ferrox::engine {

namespace {

std::string CopyOf(const std::string& file_path) { return file_path + ".copy"; }

/// @throws Error kBadArgument for what Save does not write.
IndexRecord RecordFrom(const Json::Value& stored) {
  IndexRecord record;
  Json::Value mappings, rebuild;
  GetJsonValue(record.path, stored, "path", true);
  if (record.path.empty() || record.path[0] != '/') throw Error(Error::kBadArgument, "the folder " + record.path);
  GetJsonValue(record.paused, stored, "paused", false);
  GetJsonValue(mappings, stored, "mappings", false);
  GetJsonValue(record.next_id, stored, "next_id", false);
  GetJsonValue(record.next_path, stored, "next_path", false);
  GetJsonValue(record.mount_point, stored, "mount_point", false);
  GetJsonValue(rebuild, stored, "rebuild", false);
  record.rebuild = RebuildState::FromJson(rebuild);
  record.share = ShareNote::FromJson(stored["share"]);
  record.slot = std::make_shared<IndexSlot>(std::move(mappings));
  return record;
}

Json::Value JsonOf(const IndexRecord& record) {
  Json::Value stored;
  stored["path"] = record.path;
  stored["paused"] = record.paused;
  stored["mappings"] = record.slot->mappings;
  if (!record.mount_point.empty()) stored["mount_point"] = record.mount_point;
  const Json::Value rebuild = record.rebuild.ToJson();
  if (!rebuild.isNull()) stored["rebuild"] = rebuild;
  if (record.share != nullptr) stored["share"] = record.share->ToJson();
  if (record.next_id.empty()) return stored;
  stored["next_id"] = record.next_id;
  stored["next_path"] = record.next_path;
  return stored;
}

}  // namespace

std::string NoSuchIndex(const std::string& id) {
  return "there is no index \"" + id + "\"; 'fileindexctl folder add' makes that of a share";
}

IndexTable::IndexTable(std::string file_path) : file_path_(std::move(file_path)) {
  const base::MutexLock guard(mutex_);
  Load();
  std::vector<std::string> ids;
  for (const auto& [id, record] : entries_) ids.push_back(id);
  for (const std::string& id : ids) EndMove(id);
}

void IndexTable::Load() {
  const bool there = IsFileExist(file_path_);
  if (Read(file_path_, entries_)) return;
  if (there) {
    Log(LOG_ERR, "%s is damaged; it is set aside and made anew", file_path_.c_str());
    SetAside(file_path_, Clock::Get().Now());
  }
  if (!Read(CopyOf(file_path_), entries_)) entries_.clear();
  if (there || !entries_.empty()) Save();
}

/// False for a file that is missing or damaged. @throws Error kInternal for one that is neither and cannot be read.
bool IndexTable::Read(const std::string& path, Entries& entries) {
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
    for (const std::string& id : file.getMemberNames()) entries[id] = RecordFrom(file[id]);
  } catch (const Error& error) {
    Log(LOG_ERR, "%s holds what no engine wrote: %s", path.c_str(), error.what());
    return false;
  }
  return true;
}

void IndexTable::Save() const {
  Json::Value file(Json::objectValue);
  for (const auto& [id, record] : entries_) file[id] = JsonOf(record);
  FERROX_FAIL_IF(!toFile(file, CopyOf(file_path_)) || !toFile(file, file_path_), Error::kEngineStorage,
                 "cannot write " + file_path_ + ": " + ErrnoText() + "; free space and try again");
}

IndexRecord IndexTable::Find(const std::string& id) const {
  const base::MutexLock guard(mutex_);
  const auto found = entries_.find(id);
  FERROX_FAIL_IF(found == entries_.end(), Error::kEngineNoSuchIndex, NoSuchIndex(id));
  return found->second;
}

std::optional<IndexRecord> IndexTable::TryFind(const std::string& id) const {
  const base::MutexLock guard(mutex_);
  const auto found = entries_.find(id);
  return found == entries_.end() ? std::nullopt : std::optional(found->second);
}

IndexTable::Entries IndexTable::All() const {
  const base::MutexLock guard(mutex_);
  return entries_;
}

void IndexTable::RefuseTaken(const std::string& id, const std::string& path, const std::string& except) const {
  const base::MutexLock guard(mutex_);
  for (const auto& [other_id, other] : entries_) {
    if (other_id == except) continue;
    FERROX_FAIL_IF(other_id == id, Error::kEngineIndexExists,
                   "there is an index \"" + id + "\" already, in " + other.path + "; delete it first");
    FERROX_FAIL_IF(other.path == path, Error::kEngineIndexExists,
                   "the folder " + path + " holds the index \"" + other_id + "\"; choose another");
  }
}

void IndexTable::Add(const std::string& id, const IndexRecord& record) {
  const base::MutexLock guard(mutex_);
  entries_[id] = record;
  try {
    Save();
  } catch (const Error&) {
    entries_.erase(id);
    throw;
  }
}

void IndexTable::Remove(const std::string& id) {
  const base::MutexLock guard(mutex_);
  entries_.erase(id);
  Save();
}

void IndexTable::FinishMove(const std::string& id) {
  const base::MutexLock guard(mutex_);
  EndMove(id);
}

void IndexTable::EndMove(const std::string& id) {
  auto node = entries_.extract(id);
  IndexRecord& record = node.mapped();
  const bool moving = !record.next_id.empty();
  // Where the file is in neither folder, the new place counts.
  if (moving && (record.path == record.next_path || IsFileExist(IndexFile(record.next_path)) ||
                 !IsFileExist(IndexFile(record.path)))) {
    if (node.key() != record.next_id) record.share.reset();
    node.key() = record.next_id;
    record.path = record.next_path;
  }
  record.next_id.clear();
  record.next_path.clear();
  entries_.insert(std::move(node));
  if (!moving) return;
  try {
    Save();
  } catch (const Error&) {
    // Logged where it arose; the next start finds the files where they are now.
  }
}

}  // namespace ferrox::engine
