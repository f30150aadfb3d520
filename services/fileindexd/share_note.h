#pragma once

#include <chrono>
#include <functional>
#include <optional>
#include <string>

#include <json/value.h>

#include "base/mutex.h"
#include "services/fileindexd/share_index.h"
#include "wire/engine_requests.h"

namespace ferrox::indexd {

/// What the host tells of a share for searches; nothing where that cannot be said now. It may ask the file system of
/// the share's folder.
using DescribeShare = std::function<std::optional<wire::IndexShare>(const std::string& share)>;

/// Sees that the engine knows which share an index is of, who may search it and by which rules: what the engine trims
/// searches of ordinary users by. Belongs to the worker's thread but for the report.
class ShareNote {
 public:
  /// `index` outlives it. `root` is the share's folder as the index has it.
  ShareNote(std::string share, std::string root, ShareIndex& index, DescribeShare describe)
      : share_(std::move(share)), root_(std::move(root)), index_(index), describe_(std::move(describe)) {}

  /// Tells the engine where that differs from what it was told last, or where that was some time ago: the engine may
  /// have been started anew with an older list of indices since. Nothing is told of a share that lies elsewhere now.
  /// @throws Error as the engine does; it is told again by the next call.
  void Tell();
  /// What the engine was told may not hold any more: the next call tells it again.
  void Forget() { told_at_.reset(); }

  /// Adds "refused" and "closed" of the status where there are such (docs/formats/daemon.md). From any thread.
  void AddTo(Json::Value& status) const;

 private:
  const std::string share_;
  const std::string root_;
  ShareIndex& index_;
  const DescribeShare describe_;
  std::optional<std::chrono::steady_clock::time_point> told_at_;
  mutable base::Mutex mutex_;
  wire::IndexShare told_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::indexd
