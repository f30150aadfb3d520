#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <json/value.h>

#include "wire/engine_requests.h"

namespace ferrox::indexd {

/// What the index knows of one document: enough to tell, with lstat alone, whether the file is to be read again.
struct IndexedEntry {
  std::string path;
  std::string stamp;  ///< size, times and inode of the file when the document was written (kova/content_extract.h)
  bool with_content = false;  ///< whether its content was wanted when it was written
  std::string content_type = {};
  int extract_version = 0;          ///< of what read its content; 0: nothing did
  bool extract_failed = false;      ///< its content, or a part of it, could not be read
  bool cut_without_reason = false;  ///< its text was cut, and it has no failure that says so: an early version wrote it
  bool has_access = true;           ///< it says who may read the file
};

/// Which of the records that were given to SetAccess are not all that is to be done, by their positions.
struct AccessGaps {
  std::vector<size_t> differing;  ///< the document is of another content than the file
  std::vector<size_t> missing;    ///< there is no document
};

/// Of a document whose content was wanted, and was not read or not all of it: its type, and the version of what read
/// it.
struct UnreadContent {
  std::string type;
  int version = 0;
};

/// The documents directly in a folder.
struct FolderState {
  std::string path;
  std::optional<uint64_t> digest = {};     ///< of them (wire::FolderDigest); nothing: there are too many
  std::vector<UnreadContent> unread = {};  ///< of them, each kind once
};
struct FolderPage {
  std::vector<FolderState> folders;
  bool more = false;  ///< there may be folders behind the last
};

/// One share's index, as the daemon's work needs it. The one implementation asks the engine over its socket; tests have
/// one in memory. Every call blocks for the engine's answer and may throw what its commands do. Several threads may
/// call at once.
class ShareIndex {
 public:
  virtual ~ShareIndex() = default;

  /// Whether the index exists.
  virtual bool Exists() = 0;
  /// Makes a missing index; replaces one of the same name that lies elsewhere.
  virtual void Create() = 0;
  /// The number of the present rebuilding: the engine has made the index anew, and it is to be filled. Another
  /// rebuilding has another number; 0 for an index that is complete.
  virtual int64_t Rebuilding() = 0;
  /// That rebuilding is complete; nothing happens when another has begun meanwhile.
  virtual void EndRebuilding(int64_t which) = 0;
  /// Ends a pause of the index.
  virtual void Resume() = 0;
  /// Writes the document of the file at `path`; `need_meta`: reads its content, too. @throws Error kParseFailed when
  /// the file is gone, or content extraction does not work.
  virtual void Upsert(const std::string& path, bool need_meta) = 0;
  /// Replaces what name and lstat say of the file; leaves the content. @throws Error kEngineNoSuchDocument.
  virtual void Attr(const std::string& path) = 0;
  /// Records the rights of files and folders, also of folders without a document. A document whose content is that of
  /// the stamp gets the stamp, too. At most 10,000 records.
  virtual AccessGaps SetAccess(const std::vector<wire::SeenAccess>& records) = 0;
  /// How many documents have no record of rights: an earlier version wrote them, or another program.
  virtual uint64_t WithoutAccess() = 0;
  /// Those that can be recorded are: ordinary users may search an index of an earlier version from now on.
  virtual void EndPreparing() = 0;
  /// Which share the index is of, and who may search it.
  virtual void NoteShare(const wire::IndexShare& share) = 0;
  /// Removes the documents at the paths, and, with `and_below`, all below them; in one request. Missing ones are no
  /// error.
  virtual void Delete(const std::vector<std::string>& paths, bool and_below) = 0;
  /// Moves the document at the old path, whose stamp is `stamp`, and all below it; what is below costs nothing.
  /// @throws Error kEngineNoSuchDocument, also when the stamp is another.
  virtual void Move(const std::string& new_path, const std::string& old_path, const std::string& stamp) = 0;
  /// Returns when everything before it would survive a power cut.
  virtual void Commit() = 0;
  /// At most `limit` documents below `folder`, in byte order of their paths, those after `after` when it is not "".
  virtual std::vector<IndexedEntry> List(const std::string& folder, const std::string& after, unsigned limit) = 0;
  /// The same for those directly in `folder`.
  virtual std::vector<IndexedEntry> ListIn(const std::string& folder, const std::string& after, unsigned limit) = 0;
  /// The folders at and below `folder` that have documents directly in them, in byte order of their paths with a "/" at
  /// the end, those behind `after` when it is not "".
  virtual FolderPage Folders(const std::string& folder, const std::string& after, uint64_t seed) = 0;
  /// The document at `path`; none or one.
  virtual std::vector<IndexedEntry> Find(const std::string& path) = 0;
  /// At most `limit` documents, in byte order of their paths from behind `after`, of files with several names that
  /// changed or lost a name under another of them.
  virtual std::vector<IndexedEntry> Suspects(const std::string& after, unsigned limit) = 0;
  /// At most `limit` documents, in byte order of their paths from behind `after`, of the file of that number.
  virtual std::vector<IndexedEntry> OfFile(uint64_t file, const std::string& after, unsigned limit) = 0;
  /// The engine's figures: "documents", "bytes_on_disk", "extract_errors" and others; "error" alone when it refuses.
  /// Null when the engine does not answer within `longest`.
  virtual Json::Value Figures(std::chrono::milliseconds longest) = 0;
};

/// The shares of which the engine says that their index is being rebuilt; none when it does not answer within 2 s.
std::vector<std::string> SharesBeingRebuilt();

/// The index of `share` in the search engine.
std::unique_ptr<ShareIndex> EngineShareIndex(const std::string& share);

}  // namespace ferrox::indexd
