#include "services/kovaelasticd/commands/synonyms_of_settings.h"

#include <algorithm>
#include <utility>

namespace ferrox::engine {

namespace {

constexpr std::chrono::milliseconds kLongestSynonymAsk(500);
constexpr std::chrono::seconds kSynonymsKept(1);
/// Of the time, a twentieth at most goes to questions that get no answer.
constexpr int kPausePerAsk = 20;

}  // namespace

std::optional<wire::SynonymAnswer> AskForSynonyms(const std::string& known) {
  return wire::AskSynonyms(known, kLongestSynonymAsk);
}

std::shared_ptr<const Synonyms> SynonymsOfSettings::Get() {
  std::string known;
  const Clock::time_point began = Clock::now();
  {
    const base::MutexLock lock(mutex_);
    if (began < until_) return last_;
    until_ = Clock::time_point::max();  // others do not ask meanwhile
    known = stamp_;
  }
  const std::optional<wire::SynonymAnswer> answer = ask_(known);
  std::shared_ptr<const Synonyms> read;
  if (answer.has_value() && answer->rules.has_value()) read = std::make_shared<const Synonyms>(*answer->rules);
  const Clock::time_point now = Clock::now();
  const base::MutexLock lock(mutex_);
  until_ = std::max(began + kSynonymsKept, now + kPausePerAsk * (now - began));
  if (read != nullptr) {
    stamp_ = answer->stamp;
    last_ = std::move(read);
  }
  return last_;
}

}  // namespace ferrox::engine
