#pragma once

#include <functional>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/asker.h"
#include "wire/live_files.h"

namespace ferrox::engine {

/// What the asker may open on the disk now, of paths at or below the asker's share_root: see wire::LookAs.
/// @throws Error kEngineRightsUnknown.
using LookFunction =
    std::function<std::vector<wire::LiveFile>(const Asker& asker, const std::vector<std::string>& paths)>;

/// Asks kova-access, and waits for it at most some seconds.
std::vector<wire::LiveFile> LookOnDisk(const Asker& asker, const std::vector<std::string>& paths);

/// Whether what was found at a document's path is what the document tells of, and may be read: the same file, unchanged
/// since, so that a readable file that took a secret one's name does not show the secret's words; of a folder, whose
/// content is not shown, the same folder. `stamp` is the document's.
bool IsSameAndReadable(const std::string& stamp, bool is_folder, const wire::LiveFile& live);

}  // namespace ferrox::engine
