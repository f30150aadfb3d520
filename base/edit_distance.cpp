#include "base/edit_distance.h"

#include <algorithm>

namespace base {

EditDistance::EditDistance(std::string_view word, size_t limit) : word_(word), limit_(limit) {
  Row& row = rows_.emplace_back(Row{'\0', 0, std::vector<size_t>(word.size() + 1)});
  for (size_t i = 0; i <= word.size(); ++i) row.distances[i] = i;
}

bool EditDistance::Append(char c) {
  const size_t length = rows_.size();
  Row row{c, length, std::vector<size_t>(word_.size() + 1)};
  const Row& last = rows_[length - 1];
  row.distances[0] = length;
  for (size_t i = 1; i <= word_.size(); ++i) {
    const size_t change = word_[i - 1] == c ? 0 : 1;
    size_t distance = std::min({last.distances[i] + 1, row.distances[i - 1] + 1, last.distances[i - 1] + change});
    const bool swapped = i > 1 && length > 1 && word_[i - 1] == last.last && word_[i - 2] == c;
    if (swapped) distance = std::min(distance, rows_[length - 2].distances[i - 2] + 1);
    row.distances[i] = distance;
    row.least = std::min(row.least, distance);
  }
  // The next byte may be swapped with this one, and so go on from the row before.
  const bool may_be_near = row.least <= limit_ || last.least < limit_;
  rows_.push_back(std::move(row));
  return may_be_near;
}

void EditDistance::Cut(size_t length) { rows_.erase(rows_.begin() + static_cast<ptrdiff_t>(length) + 1, rows_.end()); }

size_t EditDistance::Distance() const { return std::min(rows_.back().distances.back(), limit_ + 1); }

size_t EditDistance::DistanceOf(std::string_view other) {
  Cut(0);
  for (const char c : other) {
    if (!Append(c)) return limit_ + 1;
  }
  return Distance();
}

}  // namespace base
