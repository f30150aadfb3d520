#include "services/kovaelasticd/commands/trust_of_settings.h"

#include <algorithm>

#include "services/kovaelasticd/store/work_limit.h"

namespace ferrox::engine {

namespace {

using TrustClock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kLongestAsk(500);
constexpr std::chrono::seconds kTrustKept(1);
/// Connections are taken one at a time, and wait for this answer: it may cost them a twentieth of the time at most.
constexpr int kPausePerWait = 20;

}  // namespace

std::optional<wire::Trust> AskForTrust() { return wire::AskTrust(kLongestAsk); }

wire::Trust TrustOfSettings::Get() {
  const base::MutexLock lock(mutex_);
  const TrustClock::time_point began = TrustClock::now();
  if (began < until_) return last_;
  last_ = ask_().value_or(wire::Trust());
  WorkLimit::SetBudget(last_.memory_mib);
  const TrustClock::time_point now = TrustClock::now();
  until_ = std::max(began + kTrustKept, now + kPausePerWait * (now - began));
  return last_;
}

}  // namespace ferrox::engine
