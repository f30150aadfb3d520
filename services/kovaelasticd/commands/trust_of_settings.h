#pragma once

#include <chrono>
#include <functional>
#include <optional>
#include <utility>

#include "base/mutex.h"
#include "wire/trust.h"

namespace ferrox::engine {

/// Asks kova-access, and waits for it half a second.
std::optional<wire::Trust> AskForTrust();

/// Who may ask for users by name, as the settings say now, or said up to a second ago. While that cannot be told,
/// nobody may. They say, too, how much memory searches may have (WorkLimit::SetBudget); that is asked for with every
/// ordinary user's connection. Any thread may call; one that calls while another asks waits for that answer.
class TrustOfSettings {
 public:
  using Ask = std::function<std::optional<wire::Trust>()>;
  explicit TrustOfSettings(Ask ask = &AskForTrust) : ask_(std::move(ask)) {}

  wire::Trust Get();

 private:
  const Ask ask_;
  base::Mutex mutex_;
  wire::Trust last_ BASE_GUARDED_BY(mutex_);
  std::chrono::steady_clock::time_point until_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::engine
