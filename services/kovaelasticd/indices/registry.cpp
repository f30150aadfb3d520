#include "services/kovaelasticd/indices/registry.h"

#include <syslog.h>

#include "base/scope_exit.h"
#include "common/clock.h"
#include "common/file_util.h"
#include "common/log.h"
#include "services/kovaelasticd/store/index_files.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/sqlite_store.h"
#include "services/kovaelasticd/store/store_format.h"

namespace ferrox::engine {

namespace {

std::string PausedIndex(const std::string& id) {
  return "the index \"" + id + "\" is paused; 'fileindexctl share resume' goes on with it";
}

bool NeedsHealing(const IndexRecord& record) {
  return *record.slot->damaged || record.rebuild.Unmade() || IsIndexFileLost(record.path);
}

/// What no asker by name is shown; "" where none is answered at all.
std::string NameRulesOf(const ShareNotePtr& share) {
  return share != nullptr && share->names.has_value() ? share->names->unseen : std::string();
}

}  // namespace

Registry::Registry(const std::string& state_folder) : table_(state_folder + "/indices.json") {}

Registry::~Registry() = default;

/// Opens the store, or makes it with `create`, when the index is not open already. A file of an older format is
/// upgraded by the index itself. What the index calls on damage only sets flags: it may hold locks of its own, and
/// HealDamaged does the rest once the request is answered.
void Registry::OpenSlot(IndexSlot& slot, const std::string& path, bool create) {
  if (slot.index != nullptr) return;
  const std::string file = IndexFile(path);
  std::unique_ptr<IndexUpgrade> upgrade;
  std::unique_ptr<IndexStore> store;
  if (!IsIndexFileLost(path) && NeedsUpgrade(file)) {
    upgrade = std::make_unique<IndexUpgrade>(file, slot.schema);
  } else {
    store = std::make_unique<SqliteStore>(file, create, slot.schema);
  }
  slot.index = std::make_shared<Index>(
      std::move(store), MarkerFile(path), Index::kAutoCommitAfter,
      [this, damaged = slot.damaged] {
        *damaged = true;
        any_damaged_ = true;
      },
      std::make_unique<Scrubber>(file), std::move(upgrade));
}

/// Commits and closes; searches that run finish first.
void Registry::CloseSlot(IndexSlot& slot) {
  if (slot.index == nullptr) return;
  slot.index->Close();
  slot.index.reset();
}

/// Opens the index, and makes it anew where its file is damaged or lost.
void Registry::OpenOrHeal(const std::string& id, const IndexRecord& record, IndexSlot& slot) {
  if (NeedsHealing(record)) return Heal(id, record, slot);
  try {
    OpenSlot(slot, record.path, false);
  } catch (const IndexDamaged&) {
    *slot.damaged = true;
    return Heal(id, record, slot);
  }
  NoteMountPoint(id, record);
}

/// A missing file is a loss only where the volume is mounted as it was when the index was last seen: an index on a disk
/// that is unplugged must not be replaced by an empty one in the folder beneath its mount point.
void Registry::Heal(const std::string& id, const IndexRecord& record, IndexSlot& slot) {
  const std::string& path = record.path;
  if (record.rebuild.Unmade()) return FinishMaking(id, path, slot);
  const bool lost = IsIndexFileLost(path);
  const std::string mounted = MountPointOf(path);
  const bool away = record.mount_point.empty() ? !IsDirExist(path, true) : record.mount_point != mounted;
  FERROX_FAIL_IF(lost && away, Error::kEngineStorage,
                 "the index in " + path + " is not there, and its volume" +
                     (record.mount_point.empty() ? "" : " (" + record.mount_point + ")") +
                     " seems not to be mounted; it is used again when it is back");
  FERROX_FAIL_IF(!record.rebuild.MayBegin(Clock::Get().Now()), Error::kEngineStorage,
                 "the index in " + path + " was " + (lost ? "lost" : "damaged") +
                     " again, after it was made anew twice within a day; look at the disk first, then "
                     "'fileindexctl rebuild' makes it anew");
  MakeAnew(id, path, slot, lost ? "its file was missing" : "its file was damaged", false);
}

/// The state is on the disk before the new file is: an empty index never looks like one that is complete.
void Registry::MakeAnew(const std::string& id, const std::string& path, IndexSlot& slot, const std::string& reason,
                        bool asked) {
  const int64_t now = Clock::Get().Now();
  Log(LOG_WARNING, "the index in %s is made anew: %s", path.c_str(), reason.c_str());
  CloseSlot(slot);
  MakeIndexFolder(path);
  SetAsideIndexFiles(path, now);
  *slot.damaged = false;
  table_.Apply(id, [&](IndexRecord& record) { record.rebuild.Begin(now, reason, asked); });
  FinishMaking(id, path, slot);
}

/// Makes the new file. Also the first thing that is done for an index whose engine died before it got that far.
void Registry::FinishMaking(const std::string& id, const std::string& path, IndexSlot& slot) {
  MakeIndexFolder(path);
  OpenSlot(slot, path, true);
  table_.ApplyOrUndo(id, [mount_point = MountPointOf(path)](IndexRecord& record) {
    record.mount_point = mount_point;
    record.rebuild.SetMade(true);
  });
}

/// For indices of engines that did not note it.
void Registry::NoteMountPoint(const std::string& id, const IndexRecord& record) {
  if (!record.mount_point.empty()) return;
  try {
    table_.ApplyOrUndo(id, [&](IndexRecord& noted) { noted.mount_point = MountPointOf(record.path); });
  } catch (const Error&) {
    // Logged where it arose; tried again when the index is next asked for.
  }
}

void Registry::Rebuild(const std::string& id) {
  const base::MutexLock change(change_mutex_);
  const std::shared_ptr<IndexSlot> slot = table_.Find(id).slot;
  const base::MutexLock opening(slot->mutex);
  const IndexRecord record = table_.Find(id);
  FERROX_FAIL_IF(record.paused, Error::kEngineIndexPaused, PausedIndex(id));
  const bool away = !record.mount_point.empty() && record.mount_point != MountPointOf(record.path);
  FERROX_FAIL_IF(away, Error::kEngineStorage,
                 "the volume of the index in " + record.path + " is not mounted at " + record.mount_point);
  MakeAnew(id, record.path, *slot, "somebody asked for it", true);
}

void Registry::EndRebuild(const std::string& id, int64_t since) {
  const base::MutexLock change(change_mutex_);
  const std::shared_ptr<IndexSlot> slot = table_.Find(id).slot;
  const base::MutexLock opening(slot->mutex);
  const IndexRecord record = table_.Find(id);
  if (since == 0 || record.rebuild.Since() != since || *slot->damaged) return;
  table_.ApplyOrUndo(id, [](IndexRecord& complete) { complete.rebuild.End(); });
  RemoveSetAside(IndexFile(record.path));
}

void Registry::NoteShare(const std::string& id, ShareNote note) {
  const base::MutexLock change(change_mutex_);
  const ShareNotePtr known = table_.Find(id).share;
  if (known != nullptr && *known == note) return;
  table_.ApplyOrUndo(id, [&](IndexRecord& record) { record.share = std::make_shared<ShareNote>(std::move(note)); });
  const IndexRecord record = table_.Find(id);
  IndexSlot& slot = *record.slot;
  const base::MutexLock opening(slot.mutex);
  if (slot.index != nullptr) slot.index->SetNameRules(NameRulesOf(record.share));
}

void Registry::HealDamaged() {
  if (!any_damaged_.exchange(false)) return;
  for (const auto& [id, record] : table_.All()) {
    try {
      if (*record.slot->damaged) (void)Open(id);
    } catch (const Error&) {
      // Logged where it arose; the next request for the index fails with it.
    }
  }
}

void Registry::Create(const std::string& id, const std::string& path, const Json::Value& mappings) {
  const base::MutexLock change(change_mutex_);
  const std::optional<IndexRecord> known = table_.TryFind(id);
  if (known.has_value() && known->path == path) {
    IndexSlot& slot = *known->slot;
    const base::MutexLock opening(slot.mutex);
    SetPaused(id, false);
    return OpenOrHeal(id, table_.Find(id), slot);
  }
  table_.RefuseTaken(id, path, "");
  IndexRecord record;
  record.path = path;
  record.slot = std::make_shared<IndexSlot>(mappings);
  MakeIndexFolder(path);
  record.mount_point = MountPointOf(path);
  IndexSlot& slot = *record.slot;
  const base::MutexLock opening(slot.mutex);
  try {
    OpenSlot(slot, path, true);
  } catch (const IndexDamaged&) {
    // Left by an index of before. Who creates an index fills it.
    SetAsideIndexFiles(path, Clock::Get().Now());
    OpenSlot(slot, path, true);
  }
  table_.Add(id, record);
}

/// The slot's mutex is held until the list says "paused": a request in between would open the index again.
void Registry::Pause(const std::string& id) {
  const base::MutexLock change(change_mutex_);
  const std::shared_ptr<IndexSlot> slot = table_.Find(id).slot;
  const base::MutexLock opening(slot->mutex);
  CloseSlot(*slot);
  SetPaused(id, true);
}

void Registry::Resume(const std::string& id) {
  const base::MutexLock change(change_mutex_);
  SetPaused(id, false);
}

void Registry::SetPaused(const std::string& id, bool paused) {
  if (table_.Find(id).paused == paused) return;
  table_.Apply(id, [paused](IndexRecord& record) { record.paused = paused; });
}

/// The list forgets the index first, so that no request opens it while its files go.
void Registry::Delete(const std::string& id) {
  const base::MutexLock change(change_mutex_);
  const IndexRecord record = table_.Find(id);
  IndexSlot& slot = *record.slot;
  const base::MutexLock opening(slot.mutex);
  table_.Remove(id);
  CloseSlot(slot);
  RemoveIndexFiles(record.path);
}

/// The list notes where the index goes, the files are moved, the list notes that they are there. An engine that dies in
/// between finds the note, and by the files how far it got.
void Registry::Move(const std::string& id, const std::string& new_id, const std::string& new_path) {
  const base::MutexLock change(change_mutex_);
  const IndexRecord record = table_.Find(id);
  const std::string to_id = new_id.empty() ? id : new_id;
  const std::string to_path = new_path.empty() ? record.path : new_path;
  if (to_id == id && to_path == record.path) return;
  table_.RefuseTaken(to_id, to_path, id);
  IndexSlot& slot = *record.slot;
  const base::MutexLock opening(slot.mutex);
  const bool at_target = IsFileExist(IndexFile(to_path));
  const bool at_source = IsFileExist(IndexFile(record.path));
  FERROX_FAIL_IF(to_path != record.path && at_target && at_source, Error::kEngineIndexExists,
                 "there is another index in " + to_path + "; remove it first");
  RemoveSetAside(IndexFile(record.path));
  // What a killed engine has left beside the file goes into it first.
  if (at_source && IsFileExist(IndexFile(record.path) + "-wal")) OpenSlot(slot, record.path, false);
  CloseSlot(slot);
  table_.Apply(id, [&](IndexRecord& moving) {  // a restart in the midst of it finishes what was begun
    moving.next_id = to_id;
    moving.next_path = to_path;
  });
  const base::ScopeExit finish([this, &id] { table_.FinishMove(id); });
  if (to_path != record.path && at_source) MoveIndexFiles(record.path, to_path);
}

Registry::OpenIndex Registry::Open(const std::string& id) {
  const std::shared_ptr<IndexSlot> slot = table_.Find(id).slot;
  const base::MutexLock opening(slot->mutex);
  // While the slot's mutex was waited for, the index may have been deleted or have got another id.
  const std::optional<IndexRecord> still = table_.TryFind(id);
  FERROX_FAIL_IF(!still.has_value() || still->slot != slot, Error::kEngineNoSuchIndex, NoSuchIndex(id));
  FERROX_FAIL_IF(still->paused, Error::kEngineIndexPaused, PausedIndex(id));
  OpenOrHeal(id, *still, *slot);
  const IndexRecord record = table_.Find(id);
  slot->index->SetNameRules(NameRulesOf(record.share));
  return {id, slot->index, slot->schema, record.rebuild, record.share};
}

std::vector<Registry::Listed> Registry::List() {
  std::vector<Listed> listed;
  for (const auto& [id, record] : table_.All())
    listed.push_back({id, record.path, record.paused, record.rebuild, record.share});
  return listed;
}

}  // namespace ferrox::engine
