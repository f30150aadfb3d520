// What an index's thread does of itself.
#include <algorithm>

#include "services/kovaelasticd/indices/index.h"

namespace ferrox::engine {

namespace {

using IdleClock = std::chrono::steady_clock;

/// Between two turns of clearing, at the latest, and after one that failed.
constexpr std::chrono::milliseconds kClearLatest{250};
constexpr std::chrono::seconds kClearAgain{60};

/// While tasks come all the time, a turn is done after kClearLatest all the same.
bool IsTurn(IdleClock::time_point now, IdleClock::time_point planned, bool busy) {
  return now >= (busy ? planned + kClearLatest : planned);
}

}  // namespace

/// When the thread has something to do without a task: an automatic commit, or else a turn of comparing names, of
/// clearing, or of the scrubber, or memory to give back.
std::optional<IdleClock::time_point> Index::NextOwnWork() const {
  if (uncommitted_ > 0) return auto_commit_at_;
  if (compares_names_) return obey_at_;
  if (store_->Uncleared() > 0) return clear_at_;
  const auto give_back = store_->NextGiveBack();
  if (scrubber_ == nullptr) return give_back;
  return std::min(scrubber_->NextTurn(), give_back.value_or(IdleClock::time_point::max()));
}

/// `busy`: there were tasks just now.
void Index::DoOwnWork(bool busy) {
  gives_back_ = false;  // first, so that a search meanwhile sets it again
  store_->GiveBack(IdleClock::now());
  if (store_->NextGiveBack().has_value()) gives_back_ = true;
  if (uncommitted_ > 0) return;
  if (compares_names_) {
    ObeyNames(busy);
  } else if (store_->Uncleared() > 0) {
    Clear(busy);
  } else if (!busy && scrubber_ != nullptr) {
    Scrub();
  }
}

/// By whoever searches: the thread may be waiting, and not know that there is something to give back some day.
void Index::PlanGiveBack() {
  const base::ReaderLock guard(store_mutex_);
  if (gives_back_ || store_ == nullptr || !store_->NextGiveBack().has_value()) return;
  gives_back_ = true;
  const base::MutexLock lock(mutex_);
  wake_thread_.NotifyOne();
}

void Index::SetNameRules(const std::string& rules) {
  const base::MutexLock lock(mutex_);
  if (name_rules_ == rules) return;
  name_rules_ = rules;
  compares_names_ = true;
  wake_thread_.NotifyOne();
}

bool Index::Obeys(const std::string& rules) {
  const base::MutexLock lock(mutex_);
  return name_rules_ == rules && !compares_names_;
}

/// Ordinary users by name wait for this, so it goes before Clear, and is done as often.
void Index::ObeyNames(bool busy) {
  if (!IsTurn(IdleClock::now(), obey_at_, busy)) return;
  std::string rules;
  {
    const base::MutexLock lock(mutex_);
    rules = name_rules_;
  }
  try {
    ReportingDamage([&] { store_->ObeySome(rules); });
    obey_at_ = IdleClock::now();
  } catch (const std::exception&) {
    LoseChanges();  // logged where it arose
    obey_at_ = IdleClock::now() + kClearAgain;
  }
  const base::MutexLock lock(mutex_);
  compares_names_ = !store_->Obeys(name_rules_);
}

void Index::Clear(bool busy) {
  if (!IsTurn(IdleClock::now(), clear_at_, busy)) return;
  try {
    ReportingDamage([&] { store_->ClearSome(); });
    clear_at_ = IdleClock::now();
  } catch (const std::exception&) {
    LoseChanges();  // logged where it arose
    clear_at_ = IdleClock::now() + kClearAgain;
  }
}

void Index::Scrub() {
  try {
    ReportingDamage([&] { scrubber_->Turn(); });
  } catch (const std::exception&) {
    // Logged where it arose. A damaged index is made anew with the next request to the engine.
  }
}

}  // namespace ferrox::engine
