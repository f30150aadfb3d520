#include "services/fileindexd/share_note.h"

#include <utility>

namespace ferrox::indexd {

namespace {

using std::chrono::steady_clock;

/// A note that the engine has already costs it nothing.
constexpr std::chrono::seconds kTellAgain(10);

}  // namespace

void ShareNote::Tell() {
  const std::optional<wire::IndexShare> now = describe_(share_);
  if (!now.has_value() || now->root != root_) return;
  {
    const base::MutexLock lock(mutex_);
    const bool is_new = *now != told_;
    if (!is_new && told_at_.has_value() && steady_clock::now() < *told_at_ + kTellAgain) return;
    told_ = *now;
  }
  Forget();
  index_.NoteShare(*now);
  told_at_ = steady_clock::now();
}

void ShareNote::AddTo(Json::Value& status) const {
  const base::MutexLock lock(mutex_);
  if (!told_.refused.empty()) status["refused"] = told_.refused;
  if (told_.rules.isObject() && told_.rules.isMember("closed")) status["closed"] = told_.rules["closed"];
}

}  // namespace ferrox::indexd
