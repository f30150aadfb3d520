#pragma once

#include <atomic>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace ferrox::indexd {

/// Which folders of indexed shares lie in a share, as the worker set says, and whether a round of the share's worker
/// has begun since that changed.
class InnerShareChanges {
 public:
  /// From any thread, one at a time. @return whether that is a change, which a round is to carry out; the first folders
  /// are none, as the worker's first round loads them itself.
  bool Set(const std::vector<std::string>& folders) {
    if (folders_ == folders) return false;
    const bool is_change = folders_.has_value();
    folders_ = folders;
    if (is_change) ++changes_;
    return is_change;
  }
  /// From the worker's thread.
  void RoundBegins() { seen_ = changes_.load(); }
  /// From any thread.
  bool HasUnseen() const { return changes_ != seen_; }

 private:
  std::optional<std::vector<std::string>> folders_;
  std::atomic<uint64_t> changes_{0};
  std::atomic<uint64_t> seen_{0};  ///< `changes_` when the present or last round began
};

}  // namespace ferrox::indexd
