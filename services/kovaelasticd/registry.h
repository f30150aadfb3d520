#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/index.h"
#include "services/kovaelasticd/schema.h"

namespace ferrox::engine {

/// The indices that the engine knows: where each lies, whether it is paused. Kept in one file of the state folder,
/// which is the old or the new one at any moment. Indices are opened when they are first asked for.
class Registry {
 public:
  /// @throws Error kInternal when the file is damaged or cannot be read.
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

  /// An index that is open, and the schema of its documents.
  struct OpenIndex {
    std::string id;
    std::shared_ptr<Index> index;
    std::shared_ptr<const Schema> schema;
  };
  /// @throws Error kEngineNoSuchIndex, kEngineIndexPaused, kEngineStorage.
  OpenIndex Open(const std::string& id);

  struct Listed {
    std::string id;
    std::string path;
    bool paused = false;
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

    std::mutex open_mutex;         ///< held while the index is opened, closed or moved; taken before the registry's
    std::shared_ptr<Index> index;  ///< guarded by open_mutex; null while it is not open
  };
  using EntryPtr = std::shared_ptr<Entry>;

  void Load();
  void Save();
  EntryPtr Find(const std::string& id);
  static void OpenEntry(Entry& entry, const std::string& path, bool create);
  static void CloseEntry(Entry& entry);
  void SetPaused(Entry& entry, bool paused);
  void RefuseTaken(const std::string& id, const std::string& path, const Entry* except);
  void FinishMove(const std::string& id);

  std::mutex change_mutex_;  ///< one change of the registry at a time; taken before all others
  std::mutex mutex_;
  std::string file_path_;
  std::map<std::string, EntryPtr> entries_;
};

}  // namespace ferrox::engine
