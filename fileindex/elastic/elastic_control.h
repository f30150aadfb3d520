#pragma once

#include <string>
#include <vector>

#include <json/value.h>

#include "common/export.h"

/// What the library asks of the search engine, one function a command. One index per share, one document per file or
/// folder, its id the full path. Each blocks while the engine is busy and throws what SendRequest does, besides its
/// own.
namespace ferrox::fileindex::elastic {

/// The schema of a share's index, the three parts of the request that makes one: no settings, the fields with their
/// attributes, and where the event handler lies.
/// @throws Error kInternal when a built-in text is damaged.
FERROX_EXPORT Json::Value GetFileIndexSettings();
FERROX_EXPORT Json::Value GetFileIndexMappings();
FERROX_EXPORT Json::Value GetFileIndexEventHandler();

/// The id under which the engine keeps the share's index: "fileindex_" and the share's name.
FERROX_EXPORT std::string GetFileIndexID(const std::string& share);

/// The index of a share. Create makes it empty at the share's database path; Pause closes it, so that its files can go
/// away with their volume, and Resume opens it again; Delete drops it with its documents. Migrate has the engine move
/// it to another path; Rename likewise, and gives it the other share's id.
/// @throws Error kNoSuchShare, kInternal for the share's database path; kEngineIndexExists and kEngineNoSuchIndex are
/// the engine's own.
FERROX_EXPORT void ShareIndexCreate(const std::string& share);
FERROX_EXPORT void ShareIndexPause(const std::string& share);
FERROX_EXPORT void ShareIndexResume(const std::string& share);
FERROX_EXPORT void ShareIndexDelete(const std::string& share);
FERROX_EXPORT void ShareIndexMigrate(const std::string& share, const std::string& db_path);
FERROX_EXPORT void ShareIndexRename(const std::string& share_from, const std::string& share_to,
                                    const std::string& db_path);

/// Builds the document of the file at `path`, with its content's metadata when `need_meta`, and stores it. Reads the
/// file in the calling thread; several threads may index at once.
/// @throws Error kParseFailed "Parse failed, path=..." when the document cannot be built.
FERROX_EXPORT void IndexUpsert(const std::string& share, const std::string& path, bool need_meta);
/// Refreshes the fields that need no content; the other fields of a stored document stay.
FERROX_EXPORT void IndexAttr(const std::string& share, const std::string& path);
FERROX_EXPORT void IndexDel(const std::string& share, const std::string& path);
/// Deletes all below `dir`, not the folder's own document.
FERROX_EXPORT void IndexDelDir(const std::string& share, const std::string& dir);
/// Moves the document at `old_path`, and all below it, to `new_path`.
/// @throws Error kBadEngineReply when the list of what lies below is unusable.
FERROX_EXPORT void IndexRename(const std::string& share, const std::string& new_path, const std::string& old_path);
/// The same in one request, which the engine carries out at once however much lies below. Refused when the document's
/// "_KOVAStamp" is not `stamp`; "": it may be any. @throws Error kEngineNoSuchDocument then, and as IndexRename.
FERROX_EXPORT void IndexMove(const std::string& share, const std::string& new_path, const std::string& old_path,
                             const std::string& stamp);
/// Appends to `paths` the paths of all documents below `prefix` in the index `index_id`; all come in one reply.
/// @throws Error kBadEngineReply.
FERROX_EXPORT void IndexGetByPrefixPath(const std::string& index_id, const std::string& prefix,
                                        std::vector<std::string>& paths);
/// Makes everything sent before durable. @throws Error kSpaceNotEnough when it failed and the share's volume is full;
/// the share is then marked as needing a reindex.
FERROX_EXPORT void IndexCommit(const std::string& share);
/// Rebuilds the engine's term suggestions of the named fields.
FERROX_EXPORT void UpdateTermSuggestion(const std::string& db_name, const std::vector<std::string>& fields);

}  // namespace ferrox::fileindex::elastic
