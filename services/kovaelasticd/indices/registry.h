#pragma once

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include <json/value.h>

#include "base/mutex.h"
#include "services/kovaelasticd/indices/index.h"
#include "services/kovaelasticd/indices/index_table.h"
#include "services/kovaelasticd/indices/rebuild_state.h"
#include "services/kovaelasticd/indices/share_note.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

/// The indices that the engine knows and those of them that are open. The list is an IndexTable; an index is opened at
/// the first request for it, and stays open until it is paused, deleted or moved, or the engine ends. Any thread may
/// call any member. A change of the list waits for other changes and for what opens or closes the same index; requests
/// for other indices go on meanwhile.
///
/// What an index holds can be read again from the shares. So an index whose file is damaged, or gone although its
/// volume is mounted, is made anew, empty; it is reported as being rebuilt until EndRebuild says that it is filled
/// again. After RebuildState::kInADay of these within a day it stays as it is, since its disk is at fault then.
class Registry {
 public:
  /// @throws Error kInternal when the list cannot be read. A damaged one is set aside.
  explicit Registry(const std::string& state_folder);
  Registry(const Registry&) = delete;
  Registry& operator=(const Registry&) = delete;
  ~Registry();

  /// Makes an index in the folder `path`. An index of that id at that place keeps its content, and is no longer paused.
  /// @throws Error kEngineIndexExists when the id or the folder is taken; kEngineBadRequest; kEngineStorage.
  void Create(const std::string& id, const std::string& path, const Json::Value& mappings);
  /// Closes the index, so that its volume can be unmounted, and refuses requests for it until Resume.
  void Pause(const std::string& id);
  void Resume(const std::string& id);
  /// Removes the index and its files.
  void Delete(const std::string& id);
  /// Gives the index another id or folder; "": as it is. Copies its file when the folder is on another volume.
  /// @throws Error kEngineIndexExists when the new id or folder is taken.
  void Move(const std::string& id, const std::string& new_id, const std::string& new_path);
  /// Sets the index's file aside and makes the index anew, because a request asks for it.
  void Rebuild(const std::string& id);
  /// The rebuilding that began at `since` is complete; does nothing when another has begun meanwhile.
  void EndRebuild(const std::string& id, int64_t since);
  /// Notes which share the index is of; costs nothing where that is noted already.
  /// @throws Error kEngineNoSuchIndex; kEngineStorage, the old note holds then.
  void NoteShare(const std::string& id, ShareNote note);
  /// Makes the indices anew of which a request has found that they are damaged. Never throws.
  void HealDamaged();

  /// An index that is open, and the schema of its documents.
  struct OpenIndex {
    std::string id;
    std::shared_ptr<Index> index;
    std::shared_ptr<const Schema> schema;
    RebuildState rebuild;
    ShareNotePtr share;
  };
  /// @throws Error kEngineNoSuchIndex, kEngineIndexPaused, kEngineStorage.
  OpenIndex Open(const std::string& id);

  struct Listed {
    std::string id;
    std::string path;
    bool paused = false;
    RebuildState rebuild;
    ShareNotePtr share;
  };
  std::vector<Listed> List();

 private:
  void OpenSlot(IndexSlot& slot, const std::string& path, bool create) BASE_REQUIRES(slot.mutex);
  static void CloseSlot(IndexSlot& slot) BASE_REQUIRES(slot.mutex);
  void OpenOrHeal(const std::string& id, const IndexRecord& record, IndexSlot& slot) BASE_REQUIRES(slot.mutex);
  void Heal(const std::string& id, const IndexRecord& record, IndexSlot& slot) BASE_REQUIRES(slot.mutex);
  void MakeAnew(const std::string& id, const std::string& path, IndexSlot& slot, const std::string& reason, bool asked)
      BASE_REQUIRES(slot.mutex);
  void FinishMaking(const std::string& id, const std::string& path, IndexSlot& slot) BASE_REQUIRES(slot.mutex);
  void NoteMountPoint(const std::string& id, const IndexRecord& record);
  void SetPaused(const std::string& id, bool paused);

  base::Mutex change_mutex_;  ///< one Create, Pause, Delete, Move or rebuild at a time; taken before all others
  IndexTable table_;
  std::atomic<bool> any_damaged_{false};  ///< for HealDamaged: some slot is marked as damaged
};

}  // namespace ferrox::engine
