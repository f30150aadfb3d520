#include "services/kovaelasticd/search/column_order.h"

#include <algorithm>
#include <limits>
#include <string>
#include <utility>

#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

namespace {

/// Up to so many documents, their rows are read and sorted; the walk along a column's index would pass over too many
/// others to find them.
constexpr int64_t kFetchForOrderMax = 5000;

const char* ColumnOf(SortKey sort) {
  return sort == SortKey::kDate ? "mtime" : sort == SortKey::kSize ? "size" : "name";
}

}  // namespace

RankedDocument ColumnOrder::Entry(int64_t id, const Statement& row, int column) const {
  RankedDocument entry(id);
  if (request_.sort == SortKey::kName) {
    entry.name_key = row.Text(column);
  } else {
    entry.number_key = row.IsNull(column) ? std::numeric_limits<int64_t>::min() : row.Int(column);
  }
  return entry;
}

bool ColumnOrder::IsBefore(const RankedDocument& a, const RankedDocument& b) const {
  const RankedDocument& less = request_.ascending ? a : b;
  const RankedDocument& more = request_.ascending ? b : a;
  if (request_.sort == SortKey::kName) return CompareNames(less.name_key, more.name_key) < 0;
  return less.number_key < more.number_key;
}

/// Few documents: their columns are read and sorted.
std::vector<RankedDocument> ColumnOrder::Fetched(const DocSet& documents) {
  std::vector<RankedDocument> ranked;
  Statement row =
      reader_.database.Prepare("SELECT " + std::string(ColumnOf(request_.sort)) + " FROM docs WHERE id = ?1");
  documents.ForEach([&](int64_t id) {
    if (row.Bind(1, id).Step()) ranked.push_back(Entry(id, row, 0));
    row.Reset();
    return true;
  });
  const auto before = [this](const RankedDocument& a, const RankedDocument& b) { return IsBefore(a, b); };
  std::stable_sort(ranked.begin(), ranked.end(), before);
  for (size_t at = std::min(Skipped(), ranked.size()); at < std::min(Needed(), ranked.size());) {
    const auto [first, last] = std::equal_range(ranked.begin(), ranked.end(), ranked[at], before);
    ties_.Sort(first, last);
    at = static_cast<size_t>(std::distance(ranked.begin(), last));
  }
  return ranked;
}

/// Many documents: the column's index is walked until the page is full, and on to the last equal one of its last.
std::vector<RankedDocument> ColumnOrder::Walked(const DocSet& documents) {
  const std::string column = ColumnOf(request_.sort);
  const std::string direction = request_.ascending ? " ASC" : " DESC";
  Statement row = reader_.database.Prepare("SELECT id, " + column + " FROM docs ORDER BY " + column + direction +
                                           ", id" + direction);
  std::vector<RankedDocument> ranked;
  size_t first = 0;  // of those equal to the last
  const auto settle = [&] {
    if (ranked.size() > Skipped()) ties_.Sort(ranked.begin() + static_cast<ptrdiff_t>(first), ranked.end());
    first = ranked.size();
  };
  while (row.Step()) {
    const int64_t id = row.Int(0);
    if (!documents.Contains(id)) continue;
    RankedDocument entry = Entry(id, row, 1);
    if (!ranked.empty() && IsBefore(ranked.back(), entry)) {
      settle();
      if (ranked.size() >= Needed()) return ranked;
    }
    ranked.push_back(std::move(entry));
    if (ranked.size() - first <= Ties::kByPathMax) continue;
    if (visible_.IsForAsker()) {
      DropLastEquals(ranked, first);
    } else if (ranked.size() >= Needed()) {
      return ranked;  // so many equals stay as they are
    }
  }
  settle();
  return ranked;
}

/// Of very many equals, from `first` on, only those are kept that may be needed, so that the memory stays bounded. More
/// than Ties::kByPathMax stay, which are to be in order of their PathKeys.
void ColumnOrder::DropLastEquals(std::vector<RankedDocument>& ranked, size_t first) {
  const size_t kept = std::max(Needed() - std::min(first, Needed()), Ties::kByPathMax + 1);
  if (ranked.size() - first < 2 * kept) return;
  const auto begin = ranked.begin() + static_cast<ptrdiff_t>(first);
  const auto end = begin + static_cast<ptrdiff_t>(kept);
  std::nth_element(begin, end, ranked.end(), [this](const RankedDocument& a, const RankedDocument& b) {
    return ties_.KeyComesFirst(a.id, b.id);
  });
  ranked.erase(end, ranked.end());
}

std::vector<RankedDocument> ColumnOrder::Page(const DocSet& documents, int64_t total) {
  std::vector<RankedDocument> ranked = total <= kFetchForOrderMax ? Fetched(documents) : Walked(documents);
  ranked.resize(std::min(ranked.size(), Needed()), RankedDocument(0));
  ranked.erase(ranked.begin(), ranked.begin() + std::min<ptrdiff_t>(request_.offset, std::ssize(ranked)));
  return ranked;
}

}  // namespace ferrox::engine
