#include "services/kovaelasticd/search/repair.h"

namespace ferrox::engine {

std::vector<Repair> RepairWords(StoreReader& /*reader*/, const Visible& /*visible*/,
                                const std::vector<RareWord>& /*words*/) {
  return {};
}

}  // namespace ferrox::engine
