#include "services/kovaelasticd/store/places_cache.h"

#include <malloc.h>

namespace ferrox::engine {

std::shared_ptr<const Places> PlacesCache::Latest(int64_t version) {
  const base::MutexLock guard(mutex_);
  used_ = SteadyClock::now();
  for (auto places = kept_.rbegin(); places != kept_.rend(); ++places) {
    if ((*places)->Version() <= version) return *places;
  }
  return nullptr;
}

std::shared_ptr<const Places> PlacesCache::Load(Database& database, int64_t version) {
  if (auto places = Latest(version); places != nullptr && places->Version() == version) return places;
  const base::MutexLock loading(load_mutex_);
  const std::shared_ptr<const Places> before = Latest(version);
  if (before != nullptr && before->Version() == version) return before;
  std::shared_ptr<const Places> places = Places::Load(database, version, before.get());
  const base::MutexLock guard(mutex_);
  if (kept_.empty() || kept_.back()->Version() < version) kept_.push_back(places);
  if (kept_.size() > kVersions) kept_.pop_front();
  return places;
}

bool PlacesCache::IsLoaded() const {
  const base::MutexLock guard(mutex_);
  return !kept_.empty();
}

std::optional<PlacesCache::SteadyClock::time_point> PlacesCache::NextGiveBack() const {
  const base::MutexLock guard(mutex_);
  return kept_.empty() ? std::nullopt : std::optional(used_ + kIdle);
}

void PlacesCache::GiveBack(SteadyClock::time_point now) {
  std::deque<std::shared_ptr<const Places>> dropped;
  {
    const base::MutexLock guard(mutex_);
    if (kept_.empty() || now < used_ + kIdle) return;
    dropped.swap(kept_);
  }
  dropped.clear();
  (void)malloc_trim(0);
}

}  // namespace ferrox::engine
