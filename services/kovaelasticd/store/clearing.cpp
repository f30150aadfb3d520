#include "services/kovaelasticd/store/clearing.h"

#include <algorithm>

#include "services/kovaelasticd/store/access_records.h"

namespace ferrox::engine {

namespace {

/// A document whose words are taken out already costs that part of one whose are not.
constexpr int64_t kPurgedShare = 8;

/// So that the order of names is that of their numbers.
std::string GoneName(uint64_t number) {
  const std::string digits = std::to_string(number);
  return std::string(20 - digits.size(), '0') + digits;
}

}  // namespace

bool Clearing::IsLarge(int64_t folder) {
  std::vector<int64_t> folders = {folder};
  int64_t left = limits_.large;
  for (size_t i = 0; i < folders.size() && left > 0; ++i, --left) {
    Statement documents = database_.Prepare("SELECT count(*) FROM (SELECT 1 FROM docs WHERE folder = ?1 LIMIT ?2)");
    if (documents.Bind(1, folders[i]).Bind(2, left).Step()) left -= documents.Int(0);
    Statement below = database_.Prepare("SELECT id FROM folders WHERE parent = ?1 LIMIT ?2");
    for (below.Bind(1, folders[i]).Bind(2, limits_.large); below.Step();) folders.push_back(below.Int(0));
  }
  return left <= 0;
}

void Clearing::TakeOut(int64_t folder) {
  DocSet documents;
  Statement rows = database_.Prepare("SELECT id, text_bytes, access FROM docs WHERE folder = ?1");
  for (const int64_t below : tree_.AtAndBelow(folder)) {
    for (rows.Bind(1, below); rows.Step();) {
      documents.Add(rows.Int(0));
      --totals_.documents;
      ++totals_.clearing;
      totals_.with_content -= rows.Int(1) > 0 ? 1 : 0;
      totals_.text_bytes -= rows.Int(1);
      totals_.without_access -= rows.Int(2) == AccessRecords::kNone ? 1 : 0;
    }
    rows.Reset();
  }
  // Higher than all names before, also those of before the index was opened.
  last_name_ = std::max(last_name_ + 1, static_cast<uint64_t>(totals_.version + 1) << 20);
  tree_.TakeOut(folder, GoneName(last_name_));
  links_.OnTakenOut(documents);
}

void Clearing::Forget() {
  folders_.clear();
  EndPurge();
}

void Clearing::Turn() {
  const bool is_large_part = totals_.clearing * limits_.purged_part >= totals_.documents + totals_.clearing;
  if (!purge_.has_value() && folders_.empty() && can_purge_ && is_large_part) BeginPurge();
  purge_.has_value() && !purge_->done ? ContinuePurge() : RemoveRows();
}

void Clearing::BeginPurge() {
  purge_.emplace(Purge{DocSet(), false});
  for (const int64_t gone : FolderTree::GoneAfter(database_, "")) {
    AddDocumentsIn(database_, tree_.AtAndBelow(gone), purge_->documents);
  }
}

void Clearing::ContinuePurge() {
  const Words::Purged purged = words_.Purge(purge_->documents, limits_.turn_pages);
  purge_->done = purged == Words::Purged::kDone;
  if (purged != Words::Purged::kImpossible) return;
  can_purge_ = false;
  EndPurge();
}

void Clearing::EndPurge() {
  purge_.reset();
  words_.EndPurge();
}

/// With the words of those that were not purged.
void Clearing::RemoveRows() {
  int64_t documents_left = limits_.turn_documents * (purge_.has_value() ? kPurgedShare / 2 : 1);
  int64_t bytes_left = limits_.turn_bytes;
  for (;;) {
    if (folders_.empty()) {
      const std::vector<int64_t> gone = FolderTree::GoneAfter(database_, "");
      if (gone.empty()) {
        EndPurge();
        break;
      }
      folders_ = tree_.AtAndBelow(gone.front());
    }
    const int64_t folder = folders_.back();
    RemoveDocuments(folder, documents_left, bytes_left);
    const bool full = documents_left == 0 || bytes_left <= 0;
    if (full && totals_.clearing > 0) break;  // behind the last document its empty folders go, too
    database_.Prepare("DELETE FROM folders WHERE id = ?1").Bind(1, folder).Run();
    folders_.pop_back();
  }
  words_.Flush();
}

void Clearing::RemoveDocuments(int64_t folder, int64_t& documents_left, int64_t& bytes_left) {
  static const std::string sql = std::string(kSelectRow) + "WHERE folder = ?1 LIMIT ?2";
  std::vector<StoredDocument> documents;
  Statement rows = database_.Prepare(sql);
  rows.Bind(1, folder).Bind(2, documents_left);
  while (bytes_left > 0 && rows.Step()) {
    documents.push_back(ReadRow(rows, ""));
    bytes_left -= documents.back().text_bytes / (purge_.has_value() ? kPurgedShare : 1);
  }
  rows.Reset();
  for (const StoredDocument& stored : documents) {
    if (purge_.has_value() && purge_->documents.Contains(stored.id)) {
      words_.RemovePurged(stored.id);
    } else {
      words_.Remove(stored);
    }
    links_.Forget(stored.id, stored.row);
    database_.Prepare("DELETE FROM docs WHERE id = ?1").Bind(1, stored.id).Run();
    --totals_.clearing;
  }
  documents_left -= std::ssize(documents);
}

}  // namespace ferrox::engine
