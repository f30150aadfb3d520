#include "services/kovaelasticd/commands/live_page.h"

#include <algorithm>
#include <iterator>
#include <utility>

#include "base/path.h"
#include "services/kovaelasticd/commands/search_request.h"

namespace ferrox::engine {

namespace {

constexpr int kRoundsMax = 5;

/// Which of these hits may be shown, in their order; one look for each share.
std::vector<bool> CheckLive(const std::vector<AskedIndex>& indices, const std::vector<IndexHit>& hits,
                            const LookFunction& look) {
  std::vector<bool> shown(hits.size(), false);
  for (size_t index = 0; index < indices.size(); ++index) {
    const Asker& asker = indices[index].asker.value();
    std::vector<size_t> places;
    std::vector<std::string> paths;
    for (size_t i = 0; i < hits.size(); ++i) {
      if (hits[i].index != index || !base::IsAtOrBelow(hits[i].hit.path, asker.share_root)) continue;
      places.push_back(i);
      paths.push_back(hits[i].hit.path);
    }
    if (paths.empty()) continue;
    const std::vector<wire::LiveFile> live = look(asker, paths);
    for (size_t i = 0; i < places.size() && live.size() == paths.size(); ++i) {
      const SearchHit& hit = hits[places[i]].hit;
      shown[places[i]] = IsSameAndReadable(hit.stamp, hit.is_folder, live[i]);
    }
  }
  return shown;
}

/// How many hits the round looks at: the more, the more rounds did not fill the page.
int64_t RoundLimit(int round, int64_t missing, int64_t at) {
  return std::min({missing << (2 * round), kHitsMax, kLastHitMax - at});
}

/// Lowers the totals by the hits that were dropped, of which `dropped_all` have all words. What was found is counted
/// anew in each round, and may have become less since.
void LowerTotals(MergedReply& found, int64_t dropped, int64_t dropped_all) {
  const auto shown_all =
      std::count_if(found.hits.begin(), found.hits.end(), [](const IndexHit& shown) { return shown.hit.has_all; });
  found.total = std::max<int64_t>(found.total - dropped, std::ssize(found.hits));
  if (!found.total_all.has_value()) return;
  found.total_all = std::min(std::max<int64_t>(*found.total_all - dropped_all, shown_all), found.total);
  if (found.total_all == found.total) found.total_all.reset();
}

}  // namespace

LivePage SearchLivePage(std::vector<AskedIndex>& indices, const SearchRequest& request, const LookFunction& look,
                        const LeaveOutFunction& leave_out) {
  LivePage page{{}, request.offset};
  int64_t dropped = 0;
  int64_t dropped_all = 0;
  for (int round = 0; round < kRoundsMax; ++round) {
    SearchRequest part = request;
    part.offset = page.next_offset;
    part.limit = RoundLimit(round, request.limit - std::ssize(page.found.hits), part.offset);
    MergedReply found = SearchIndices(indices, part, leave_out);
    std::vector<IndexHit> hits = std::move(found.hits);
    const std::vector<bool> shown = CheckLive(indices, hits, look);
    found.hits = std::move(page.found.hits);
    page.found = std::move(found);
    for (size_t i = 0; i < hits.size() && std::ssize(page.found.hits) < request.limit; ++i) {
      ++page.next_offset;
      if (shown[i]) {
        page.found.hits.push_back(std::move(hits[i]));
      } else {
        ++dropped;
        dropped_all += hits[i].hit.has_all ? 1 : 0;
      }
    }
    const bool ended = std::ssize(hits) < part.limit || page.next_offset >= kLastHitMax;
    if (ended || std::ssize(page.found.hits) >= request.limit) break;
  }
  LowerTotals(page.found, dropped, dropped_all);
  return page;
}

}  // namespace ferrox::engine
