#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

/// The upgrade of an index file from an older format: all that it holds is written into a new file of the present
/// format beside it, which then takes its place. The old file is only read until then, so that searches go on with it
/// (older_format.h), and a kill at any moment leaves either file whole; an unfinished new one is begun anew. Documents
/// keep their numbers. No file of a share is read: what an older format lacks is made from stored documents and texts.
struct UpgradeOptions {
  int64_t turn_bytes = 8 << 20;  ///< of what is read, between two calls of `on_turn`
  int64_t pages_max = 0;         ///< of the new file, for tests of a full volume; 0: no limit
  /// How far it is, in documents. What it throws ends the upgrade.
  std::function<void(int64_t done, int64_t of)> on_turn = [](int64_t, int64_t) {};
};

/// Writes the new file; it is on the disk and complete when this returns, and gone when it throws. Nobody may change
/// the old one meanwhile.
/// @throws Error kEngineStorage, which tells the space that is needed where there is too little; IndexDamaged, as the
/// old file is.
void WriteUpgraded(const std::string& path, std::shared_ptr<const Schema> schema, const UpgradeOptions& options);

/// Has the new file take the place of the old one, which nobody may have open. @throws Error kEngineStorage.
void ReplaceByUpgraded(const std::string& path);

}  // namespace ferrox::engine
