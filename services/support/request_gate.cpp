#include "services/support/request_gate.h"

#include <algorithm>

namespace ferrox::services {

RequestGate::Admission RequestGate::Enter(uid_t uid, uint64_t id, bool for_many) {
  Count& count = counts_[uid];
  count.for_many = for_many;
  if (count.waiting == 0 && MayRun(count)) {
    ++at_work_;
    ++count.at_work;
    return Admission::kRun;
  }
  if (!for_many && count.waiting >= limits_.waiting_each) {
    DropIfUnused(uid);
    return Admission::kRefused;
  }
  ++count.waiting;
  waiting_.push_back({uid, id});
  return Admission::kWait;
}

void RequestGate::Leave(uid_t uid) {
  --at_work_;
  --counts_[uid].at_work;
  DropIfUnused(uid);
}

std::optional<uint64_t> RequestGate::Next() {
  auto next = waiting_.end();
  for (auto it = waiting_.begin(); it != waiting_.end(); ++it) {
    const Count& count = counts_[it->uid];
    if (!MayRun(count)) continue;
    if (next == waiting_.end() || count.at_work < counts_[next->uid].at_work) next = it;
  }
  if (next == waiting_.end()) return std::nullopt;
  const uint64_t id = next->id;
  Count& count = counts_[next->uid];
  --count.waiting;
  ++count.at_work;
  ++at_work_;
  waiting_.erase(next);
  return id;
}

void RequestGate::Forget(uid_t uid, uint64_t id) {
  const auto found = std::find_if(waiting_.begin(), waiting_.end(), [id](const Waiting& one) { return one.id == id; });
  if (found == waiting_.end()) return;
  waiting_.erase(found);
  --counts_[uid].waiting;
  DropIfUnused(uid);
}

void RequestGate::DropIfUnused(uid_t uid) {
  const auto found = counts_.find(uid);
  if (found->second.at_work == 0 && found->second.waiting == 0) counts_.erase(found);
}

}  // namespace ferrox::services
