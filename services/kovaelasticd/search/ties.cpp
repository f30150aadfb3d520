#include "services/kovaelasticd/search/ties.h"

#include <algorithm>

namespace ferrox::engine {

void Ties::Sort(Iterator begin, Iterator end) {
  const auto count = static_cast<size_t>(std::distance(begin, end));
  if (count < 2) return;
  if (count > kByPathMax) {
    if (!visible_.IsForAsker()) return;
    std::sort(begin, end,
              [this](const RankedDocument& a, const RankedDocument& b) { return KeyComesFirst(a.id, b.id); });
    return;
  }
  std::vector<std::pair<std::string, size_t>> paths;
  paths.reserve(count);
  for (auto document = begin; document != end; ++document) paths.emplace_back(PathOf(document->id), paths.size());
  std::sort(paths.begin(), paths.end());
  std::vector<RankedDocument> sorted;
  sorted.reserve(count);
  for (const auto& [path, place] : paths) sorted.push_back(std::move(begin[static_cast<ptrdiff_t>(place)]));
  std::move(sorted.begin(), sorted.end(), begin);
}

std::string Ties::PathOf(int64_t id) {
  Statement row = reader_.database.Prepare("SELECT folder, leaf FROM docs WHERE id = ?1");
  if (!row.Bind(1, id).Step()) return "";
  return reader_.tree.PathOf(row.Int(0)).append(row.Text(1));
}

uint64_t LeastKeys::Bound() {
  Shorten();
  return keys_.size() < most_ || keys_.empty() ? UINT64_MAX : keys_.back();
}

/// The greatest comes last.
void LeastKeys::Shorten() {
  if (keys_.size() < most_ || most_ == 0) return;
  std::nth_element(keys_.begin(), keys_.begin() + static_cast<ptrdiff_t>(most_) - 1, keys_.end());
  keys_.resize(most_);
}

}  // namespace ferrox::engine
