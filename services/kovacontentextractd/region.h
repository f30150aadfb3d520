#pragma once

#include <cstddef>
#include <functional>
#include <string_view>

#include "base/unique_fd.h"

namespace ferrox::extract {

/// Takes a piece of a text, which begins at byte `offset` of it. May throw.
using TextSink = std::function<void(size_t offset, std::string_view piece)>;

/// Makes the memory that a worker shares with the daemon: kRegionBytes, whose size nobody can change. Not valid, with
/// errno, when there is none.
base::UniqueFd MakeRegion();

/// Hands on the text at the beginning of a worker's region. The worker may write there at any time, so the text is
/// copied first, and what has been copied is checked.
/// @return false when it is longer than a text may be, or no UTF-8; the sink may have taken pieces of it then
bool CopyText(int region, size_t bytes, const TextSink& sink);

/// Copies an attachment out of a worker's region into memory of its own, which nobody can change afterwards. Not valid,
/// with errno, when there is none.
base::UniqueFd CopyAttachment(int region, size_t offset, size_t bytes);

/// Gives back the memory that the attachments in a region, `bytes` together, took.
void FreeAttachments(int region, size_t bytes);

}  // namespace ferrox::extract
