#include "services/kovaelasticd/store/readable_cache.h"

#include <cstdint>
#include <map>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "base/mutex.h"

namespace ferrox::engine {

namespace {

/// The sets of all indices of the process.
class KeptSets {
 public:
  /// The last tells whether names are looked at: by which rules follows from the version.
  using Key = std::tuple<const ReadableCache*, uint32_t, std::vector<uint32_t>, std::string, bool>;
  using Set = std::shared_ptr<const ReadableDocuments>;

  static KeptSets& Get() {
    static KeptSets sets;
    return sets;
  }

  Set Find(const Key& key) {
    const base::MutexLock guard(mutex_);
    const auto found = kept_.find(key);
    if (found == kept_.end()) return nullptr;
    found->second.used = ++now_;
    return found->second.set;
  }

  void Keep(Key key, Set set) {
    const size_t bytes = set->SizeBytes() + sizeof(Kept) + sizeof(Key) + std::get<3>(key).capacity() +
                         std::get<2>(key).capacity() * sizeof(uint32_t);
    if (bytes > ReadableCache::kKeptMaxBytes) return;
    const base::MutexLock guard(mutex_);
    Kept& kept = kept_[std::move(key)];
    if (kept.set != nullptr && kept.set->Version() > set->Version()) return;
    bytes_ += bytes - std::exchange(kept.bytes, bytes);
    kept.set = std::move(set);
    kept.used = ++now_;
    while (bytes_ > ReadableCache::kKeptMaxBytes) DropOldest();
  }

  void Drop(const ReadableCache* owner) {
    const base::MutexLock guard(mutex_);
    for (auto kept = kept_.begin(); kept != kept_.end();) {
      const bool is_theirs = std::get<0>(kept->first) == owner;
      bytes_ -= is_theirs ? kept->second.bytes : 0;
      kept = is_theirs ? kept_.erase(kept) : std::next(kept);
    }
  }

 private:
  struct Kept {
    Set set;
    size_t bytes = 0;
    uint64_t used = 0;
  };

  void DropOldest() BASE_REQUIRES(mutex_) {
    auto oldest = kept_.begin();
    for (auto kept = kept_.begin(); kept != kept_.end(); ++kept) {
      if (kept->second.used < oldest->second.used) oldest = kept;
    }
    bytes_ -= oldest->second.bytes;
    kept_.erase(oldest);
  }

  base::Mutex mutex_;
  std::map<Key, Kept> kept_ BASE_GUARDED_BY(mutex_);
  size_t bytes_ BASE_GUARDED_BY(mutex_) = 0;
  uint64_t now_ BASE_GUARDED_BY(mutex_) = 0;  ///< counts uses
};

}  // namespace

std::shared_ptr<const ReadableDocuments> ReadableCache::Load(Database& database, FolderTree& tree, const Places& places,
                                                             const Asker& asker) {
  KeptSets::Key key(this, asker.uid, asker.groups, asker.share_root, !asker.unseen_names.empty());
  KeptSets::Set before = KeptSets::Get().Find(key);
  if (before != nullptr && before->Version() == places.Version()) return before;
  // A search that began before the last commits does without what is kept.
  if (before != nullptr && before->Version() > places.Version()) before.reset();
  KeptSets::Set set = ReadableDocuments::Make(database, tree, places, asker, before.get());
  KeptSets::Get().Keep(std::move(key), set);
  return set;
}

void ReadableCache::GiveBack() { KeptSets::Get().Drop(this); }

}  // namespace ferrox::engine
