#pragma once

#include <atomic>
#include <map>
#include <memory>
#include <optional>
#include <string>

#include <json/value.h>

#include "base/mutex.h"
#include "common/error.h"
#include "services/kovaelasticd/indices/index.h"
#include "services/kovaelasticd/indices/rebuild_state.h"
#include "services/kovaelasticd/indices/share_note.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

/// Where an index is kept open. It belongs to one index for all of its life, also when that gets another id or folder.
struct IndexSlot {
  explicit IndexSlot(Json::Value from) : mappings(std::move(from)), schema(std::make_shared<Schema>(mappings)) {}

  const Json::Value mappings;  ///< as the index was created with
  const std::shared_ptr<const Schema> schema;
  base::Mutex mutex;  ///< held while the index is opened, closed, moved or made anew; taken before the table's
  std::shared_ptr<Index> index BASE_GUARDED_BY(mutex);  ///< null while it is not open
  /// Whether the open index has met damage. Shared with the index, which may outlive the slot: searches that run keep
  /// it.
  const std::shared_ptr<std::atomic<bool>> damaged = std::make_shared<std::atomic<bool>>(false);
};

/// What the engine notes of an index, a copy.
struct IndexRecord {
  std::string path;  ///< the folder of its files
  bool paused = false;
  std::string next_id;      ///< while its files are being moved: the id and the folder that it gets; else ""
  std::string next_path;    ///<
  std::string mount_point;  ///< of the volume on which the index was last seen; "": not known
  RebuildState rebuild;
  ShareNotePtr share;  ///< forgotten when the index gets another id, which is another share's
  std::shared_ptr<IndexSlot> slot;
};

/// Why a request for an index that is not in the list fails.
std::string NoSuchIndex(const std::string& id);

/// The engine's list of indices: a JSON file in the state folder, "indices.json", that is replaced as a whole at each
/// change, and a copy of it, "indices.json.copy", written first. Either is whole at any moment, so a killed engine or a
/// damaged file costs nothing. Any thread may call any member; those that save wait for the disk.
class IndexTable {
 public:
  using Entries = std::map<std::string, IndexRecord>;

  /// Reads the file, or else the copy; a damaged file is set aside. Moves that a killed engine left half done are
  /// completed or forgotten. Where neither file can be used, no index is known: their files stay in their folders, and
  /// are found when they are created there again.
  /// @throws Error kInternal when the file is there and cannot be read.
  explicit IndexTable(std::string file_path);

  /// @throws Error kEngineNoSuchIndex.
  IndexRecord Find(const std::string& id) const;
  std::optional<IndexRecord> TryFind(const std::string& id) const;
  Entries All() const;
  /// @throws Error kEngineIndexExists when another index than `except` has this id or this folder.
  void RefuseTaken(const std::string& id, const std::string& path, const std::string& except) const;

  /// Adds an index; it is not in the table when that cannot be saved. @throws Error kEngineStorage, as all that follow.
  void Add(const std::string& id, const IndexRecord& record);
  void Remove(const std::string& id);
  /// Has `change` alter the record. When the file cannot be written, the change holds until the engine ends.
  template <typename Change>
  void Apply(const std::string& id, const Change& change) {
    const base::MutexLock guard(mutex_);
    change(entries_.at(id));
    Save();
  }
  /// The same; when the file cannot be written, the record is again as it was.
  template <typename Change>
  void ApplyOrUndo(const std::string& id, const Change& change) {
    const base::MutexLock guard(mutex_);
    IndexRecord& record = entries_.at(id);
    const IndexRecord before = record;
    change(record);
    try {
      Save();
    } catch (const Error&) {
      record = before;
      throw;
    }
  }
  /// Ends a move by where the index's file is: in the new folder the record gets the new id and folder, else it keeps
  /// the old ones. Never throws; what cannot be saved is found out again when the engine next starts.
  void FinishMove(const std::string& id);

 private:
  void Load() BASE_REQUIRES(mutex_);
  static bool Read(const std::string& path, Entries& entries);
  void Save() const BASE_REQUIRES(mutex_);
  void EndMove(const std::string& id) BASE_REQUIRES(mutex_);

  const std::string file_path_;
  mutable base::Mutex mutex_;
  Entries entries_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::engine
