#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "base/mutex.h"
#include "services/kovaelasticd/query/synonyms.h"
#include "wire/synonyms.h"

namespace ferrox::engine {

/// Asks kova-access, and waits for it half a second.
std::optional<wire::SynonymAnswer> AskForSynonyms(const std::string& known);

/// The administrator's synonyms, as they are now or were up to a second ago; while they cannot be told, those before.
/// Any thread may call; while one asks, others go on with what is known.
class SynonymsOfSettings {
 public:
  using Ask = std::function<std::optional<wire::SynonymAnswer>(const std::string& known)>;
  explicit SynonymsOfSettings(Ask ask) : ask_(std::move(ask)) {}

  std::shared_ptr<const Synonyms> Get();

 private:
  using Clock = std::chrono::steady_clock;

  const Ask ask_;
  base::Mutex mutex_;
  std::string stamp_ BASE_GUARDED_BY(mutex_);
  std::shared_ptr<const Synonyms> last_ BASE_GUARDED_BY(mutex_) = std::make_shared<const Synonyms>();
  Clock::time_point until_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::engine
