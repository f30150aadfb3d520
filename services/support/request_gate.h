#pragma once

#include <sys/types.h>

#include <cstdint>
#include <deque>
#include <map>
#include <optional>

namespace ferrox::services {

/// Whose request may be worked on now, of users of whom each, and all together, may only have so many at work. Requests
/// beyond that wait, without a thread; of the waiting ones that comes next whose user has the fewest at work. Not for
/// several threads at once.
class RequestGate {
 public:
  struct Limits {
    unsigned at_work_all, at_work_each, waiting_each;
  };
  enum class Admission { kRun, kWait, kRefused };

  explicit RequestGate(const Limits& limits) : limits_(limits) {}

  /// `id` is that of the request's connection. What may run is at work until Leave. One who asks for many users is
  /// bound by what all may have alone.
  Admission Enter(uid_t uid, uint64_t id, bool for_many = false);
  void Leave(uid_t uid);
  /// A request that has waited and may run now; it is at work from then on. To be asked for after each Leave.
  std::optional<uint64_t> Next();
  /// The connection has ended; its request waits no more.
  void Forget(uid_t uid, uint64_t id);

 private:
  struct Count {
    unsigned at_work = 0, waiting = 0;
    bool for_many = false;  ///< by the last request
  };
  struct Waiting {
    uid_t uid;
    uint64_t id;
  };

  bool MayRun(const Count& count) const {
    return at_work_ < limits_.at_work_all && (count.for_many || count.at_work < limits_.at_work_each);
  }
  void DropIfUnused(uid_t uid);

  const Limits limits_;
  unsigned at_work_ = 0;
  std::map<uid_t, Count> counts_;  ///< of users who have any
  std::deque<Waiting> waiting_;    ///< in the order in which they came
};

}  // namespace ferrox::services
