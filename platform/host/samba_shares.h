#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/host/share_table.h"

namespace kova::host {

/// Samba's shares, when the host's configuration asks for them; else null. They are what testparm told last: it runs
/// again (about 20 ms) when the configuration or one of Samba's files has changed, which is looked for once a second.
/// When it fails, its last good answer stays, and it is tried again after a minute.
std::shared_ptr<const std::vector<ShareEntry>> SambaShares();

/// Lets the next look-up look at these files, however short ago they were looked at.
void ExpectSambaChange();

/// The shares in what testparm writes. What cannot be a share here is told in `problems`, a sentence each.
std::vector<ShareEntry> ParseTestparm(const std::string& output, std::vector<std::string>& problems);

}  // namespace kova::host
