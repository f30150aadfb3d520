#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/host/share_table.h"

namespace kova::host {

/// Samba's shares, when the host's configuration asks for them; else null. They are what testparm printed last: it runs
/// again (about 20 ms, in which other callers wait) when the configuration or one of Samba's files has changed; whether
/// one has is asked once a second at most, by stat. When testparm fails, its last good answer stays, and it is run
/// again after a minute. May be called by several threads at once; the list that is returned does not change.
std::shared_ptr<const std::vector<ShareEntry>> SambaShares();

/// Makes the next SambaShares check these files even within the same second: for a caller that has just changed one.
void ExpectSambaChange();

/// The shares in what testparm writes. `problems` gets a sentence for each section that cannot be a share
/// here.
std::vector<ShareEntry> ParseTestparm(const std::string& output, std::vector<std::string>& problems);

}  // namespace kova::host
