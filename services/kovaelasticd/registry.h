#pragma once

#include <atomic>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/index.h"
#include "services/kovaelasticd/rebuild_state.h"
#include "services/kovaelasticd/schema.h"

namespace ferrox::engine {

/// The indices that the engine knows: where each lies, whether it is paused. Kept in one file of the state folder,
/// which is the old or the new one at any moment, and in a copy for when it is damaged. Indices are opened when they
/// are first asked for.
///
/// What an index holds can be had again. One whose file is damaged, or gone although its volume is there, is made anew;
/// it is told as being rebuilt until whoever fills it says that it is complete. After two of that in a day it stays as
/// it is, and its disk should be looked at.
class Registry {
 public:
  /// @throws Error kInternal when the file cannot be read. A damaged one is set aside.
  explicit Registry(const std::string& state_folder);
  Registry(const Registry&) = delete;
  Registry& operator=(const Registry&) = delete;
  ~Registry();

  /// Makes an index in the folder `path`. An index of that id at that place keeps what is in it; it is paused no more.
  /// @throws Error kEngineIndexExists when the id or the folder is taken; kEngineBadRequest; kEngineStorage.
  void Create(const std::string& id, const std::string& path, const Json::Value& mappings);
  void Pause(const std::string& id);
  void Resume(const std::string& id);
  /// Removes the index and its files.
  void Delete(const std::string& id);
  /// Gives the index another id or folder; empty: as it is.
  /// @throws Error kEngineIndexExists when the new id or folder is taken.
  void Move(const std::string& id, const std::string& new_id, const std::string& new_path);
  /// Sets the index's file aside and makes the index anew, because somebody asks for it.
  void Rebuild(const std::string& id);
  /// The rebuilding that began at `since` is complete; nothing happens when another has begun meanwhile.
  void EndRebuild(const std::string& id, int64_t since);
  /// Makes the indices anew of which a request has found that they are damaged. Never throws.
  void HealDamaged();

  /// An index that is open, and the schema of its documents.
  struct OpenIndex {
    std::string id;
    std::shared_ptr<Index> index;
    std::shared_ptr<const Schema> schema;
    RebuildState rebuild;
  };
  /// @throws Error kEngineNoSuchIndex, kEngineIndexPaused, kEngineStorage.
  OpenIndex Open(const std::string& id);

  struct Listed {
    std::string id;
    std::string path;
    bool paused = false;
    RebuildState rebuild;
  };
  std::vector<Listed> List();

 private:
  struct Entry {
    // Guarded by the registry's mutex.
    std::string path;
    bool paused = false;
    Json::Value mappings;
    std::shared_ptr<const Schema> schema;
    std::string next_id;  ///< while the index moves, where to
    std::string next_path;
    std::string mount_point;  ///< of the volume on which the index was last seen; "": not known
    RebuildState rebuild;

    std::mutex open_mutex;         ///< held while the index is opened, closed or moved; taken before the registry's
    std::shared_ptr<Index> index;  ///< guarded by open_mutex; null while it is not open
    /// Whether the open index has met damage; the index may outlive the entry.
    std::shared_ptr<std::atomic<bool>> damaged = std::make_shared<std::atomic<bool>>(false);
  };
  using EntryPtr = std::shared_ptr<Entry>;
  using Entries = std::map<std::string, EntryPtr>;

  void Load();
  static bool Read(const std::string& path, Entries& entries);
  void Save();
  EntryPtr Find(const std::string& id);
  void OpenEntry(Entry& entry, const std::string& path, bool create);
  void OpenOrHeal(Entry& entry, const std::string& path, bool create);
  bool NeedsHealing(const Entry& entry, const std::string& path);
  void Heal(Entry& entry, const std::string& path);
  void MakeAnew(Entry& entry, const std::string& path, const std::string& reason, bool asked);
  void FinishMaking(Entry& entry, const std::string& path);
  void NoteMountPoint(Entry& entry, const std::string& path);
  static void CloseEntry(Entry& entry);
  void SetPaused(Entry& entry, bool paused);
  void RefuseTaken(const std::string& id, const std::string& path, const Entry* except);
  void FinishMove(const std::string& id);

  std::mutex change_mutex_;  ///< one change of the registry at a time; taken before all others
  std::mutex mutex_;
  std::string file_path_;
  Entries entries_;
  std::atomic<bool> any_damaged_{false};
};

}  // namespace ferrox::engine
