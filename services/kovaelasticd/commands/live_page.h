#pragma once

#include <cstdint>
#include <vector>

#include "services/kovaelasticd/commands/live_look.h"
#include "services/kovaelasticd/commands/merged_search.h"

namespace ferrox::engine {

/// A page of hits that were all found on the disk, readable and unchanged, after they were found in their index.
struct LivePage {
  MergedReply found;    ///< hits: the page; total: less those that were dropped
  int64_t next_offset;  ///< of the first hit that was not looked at
};

/// Searches as the askers of `indices`, and looks at each hit of the page on the disk. One that may not be shown is
/// dropped, and the page filled from behind, in kRoundsMax rounds at most: a page that is still short then is not the
/// last one.
/// @throws Error kEngineRightsUnknown when the disk cannot be looked at; what `leave_out` throws.
LivePage SearchLivePage(std::vector<AskedIndex>& indices, const SearchRequest& request, const LookFunction& look,
                        const LeaveOutFunction& leave_out);

}  // namespace ferrox::engine
