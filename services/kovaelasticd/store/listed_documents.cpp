#include "services/kovaelasticd/store/listed_documents.h"

#include <algorithm>
#include <functional>
#include <iterator>
#include <limits>

namespace ferrox::engine {

/// The rows of the list: number, folder, leaf. `id`: only the document with that number; 0: all.
Statement ListedDocuments::Select(int64_t id) {
  static const std::string selects[] = {
      "SELECT docs.id, folder, leaf FROM suspects JOIN docs ON docs.id = suspects.id WHERE TRUE",
      "SELECT docs.id, folder, leaf FROM docs WHERE error IS NOT NULL",
      "SELECT docs.id, folder, leaf FROM files JOIN docs ON docs.id = files.id WHERE file = ?1"};
  const std::string& select = selects[list_ == List::kSuspects ? 0 : list_ == List::kUnread ? 1 : 2];
  Statement statement = database_.Prepare(id == 0 ? select : select + " AND docs.id = ?2");
  if (list_ == List::kFile) statement.Bind(1, file_);
  if (id != 0) statement.Bind(2, id);
  return statement;
}

/// "", which is behind no other, for a document that is to be cleared.
std::string ListedDocuments::PathIn(const Statement& row) {
  std::string path = tree_.PathOf(row.Int(1));
  return path.empty() ? path : path.append(row.Text(2));
}

std::vector<int64_t> ListedDocuments::Page(const GetRequest& request) {
  const List list = request.suspects ? List::kSuspects : request.unread ? List::kUnread : List::kFile;
  const auto file = list == List::kFile ? static_cast<int64_t>(request.file) : 0;
  const bool is_kept =
      list == list_ && file == file_ && request.after >= after_ && (end_.empty() || request.after <= end_);
  if (is_kept) {
    TakeChangesIn(request.after);
  } else {
    list_ = list;
    file_ = file;
    Gather(request.after);
  }
  used_ = SteadyClock::now();
  std::vector<int64_t> page;
  const auto page_max = request.limit < 0 ? std::numeric_limits<size_t>::max() : static_cast<size_t>(request.limit);
  while (page.size() < page_max) {
    if (kept_.empty() && !end_.empty()) Gather(end_);
    if (kept_.empty()) {
      Forget();  // that was the last page
      break;
    }
    after_ = std::move(kept_.back().path);
    page.push_back(kept_.back().id);
    kept_.pop_back();
  }
  return page;
}

/// Keeps the first of what is behind `after`.
void ListedDocuments::Gather(const std::string& after) {
  kept_.clear();
  changed_.clear();
  changed_.reserve(kChangedMax);  // OnRow must not fail
  after_ = after;
  end_.clear();
  size_t bytes = 0;
  Statement rows = Select(0);
  while (rows.Step()) {
    std::string path = PathIn(rows);
    if (path <= after || (!end_.empty() && path > end_)) continue;
    bytes += path.size() + sizeof(Entry);
    kept_.push_back({std::move(path), rows.Int(0)});
    if (bytes <= kKeptMaxBytes) continue;
    Shorten();
    bytes /= 2;
  }
  std::sort(kept_.begin(), kept_.end(), std::greater<>());
}

/// Drops the latter half.
void ListedDocuments::Shorten() {
  const auto middle = kept_.begin() + std::ssize(kept_) / 2;
  std::nth_element(kept_.begin(), middle, kept_.end(), std::greater<>());
  kept_.erase(kept_.begin(), middle);
  end_ = kept_.front().path;
}

/// Brings what is kept up to date, and drops what is not behind `after`.
void ListedDocuments::TakeChangesIn(const std::string& after) {
  after_ = after;
  while (!kept_.empty() && kept_.back().path <= after) kept_.pop_back();
  if (changed_.empty()) return;
  std::sort(changed_.begin(), changed_.end());
  changed_.erase(std::unique(changed_.begin(), changed_.end()), changed_.end());
  std::erase_if(kept_,
                [this](const Entry& entry) { return std::binary_search(changed_.begin(), changed_.end(), entry.id); });
  const auto unchanged = std::ssize(kept_);
  for (const int64_t id : changed_) {
    Statement row = Select(id);
    if (!row.Step()) continue;
    std::string path = PathIn(row);
    if (path > after && (end_.empty() || path <= end_)) kept_.push_back({std::move(path), id});
  }
  std::sort(kept_.begin() + unchanged, kept_.end(), std::greater<>());
  std::inplace_merge(kept_.begin(), kept_.begin() + unchanged, kept_.end(), std::greater<>());
  changed_.clear();
}

void ListedDocuments::OnRow(RowWatch::Table table, int64_t number, bool is_update) {
  if (list_ == List::kNone) return;
  if (table == RowWatch::Table::kFolders) {
    if (is_update) Forget();  // it may have been moved, and all paths below with it
  } else if (changed_.size() < kChangedMax) {
    changed_.push_back(number);
  } else {
    Forget();
  }
}

void ListedDocuments::Forget() {
  used_ = SteadyClock::time_point();
  list_ = List::kNone;
  kept_ = {};
  changed_ = {};
}

}  // namespace ferrox::engine
