#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <json/value.h>

namespace ferrox::engine {

/// That an index was made anew, since its file was damaged or lost, and is not yet full again; and when that was so
/// lately. A failing disk damages one file after the other: reading all shares again each time would go on for ever, so
/// only kInADay rebuildings within 24 hours begin by themselves.
class RebuildState {
 public:
  /// How many within 24 hours may begin without a request for them.
  static constexpr size_t kInADay = 2;

  /// What Begin gave; 0 for an index that is complete.
  int64_t Since() const { return since_; }
  /// Why it is made anew, the end of a sentence.
  const std::string& Reason() const { return reason_; }
  /// Whether its new file may not be there yet.
  bool Unmade() const { return since_ != 0 && !made_; }

  /// Whether one more may begin at this time, in seconds since the epoch.
  bool MayBegin(int64_t now) const;
  /// Begins one. `asked`: a client asked for it; those that began before no longer count.
  void Begin(int64_t now, const std::string& reason, bool asked);
  void SetMade(bool made) { made_ = made; }
  void End() { since_ = 0; }

  /// Null for an index that never was.
  Json::Value ToJson() const;
  /// @throws Error kBadArgument.
  static RebuildState FromJson(const Json::Value& stored);

 private:
  int64_t since_ = 0;
  std::string reason_;
  bool made_ = true;
  std::vector<int64_t> times_;  ///< when those began that no client asked for
};

}  // namespace ferrox::engine
