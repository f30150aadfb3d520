#include "services/fileindexd/comparison.h"

#include <vector>

#include "common/file_util.h"

namespace ferrox::indexd {

namespace {

constexpr unsigned kPageEntries = 1000;

/// The documents below a folder in path order, fetched by pages.
class DocumentCursor {
 public:
  DocumentCursor(const std::string& folder, ShareIndex& index) : folder_(folder), index_(index) { FetchPage(""); }

  /// Null at the end.
  const IndexedEntry* Current() const { return next_ < page_.size() ? &page_[next_] : nullptr; }

  void Advance() {
    if (++next_ == page_.size() && page_.size() == kPageEntries) FetchPage(std::string(page_.back().path));
  }

 private:
  void FetchPage(const std::string& after) {
    page_ = index_.List(folder_, after, kPageEntries);
    next_ = 0;
  }

  const std::string& folder_;
  ShareIndex& index_;
  std::vector<IndexedEntry> page_;
  size_t next_ = 0;
};

void RemoveBefore(DocumentCursor& cursor, const std::string& path, const ComparisonActions& actions) {
  while (cursor.Current() != nullptr && cursor.Current()->path < path) {
    actions.remove(cursor.Current()->path);
    cursor.Advance();
  }
}

/// Leaves the documents of what cannot be read as they are. Of an unreadable folder these are all below it, and they
/// come in one piece since both sides are in path order.
void Keep(DocumentCursor& cursor, const TreeWalk::Entry& entry, const ComparisonActions& actions) {
  const bool below = entry.kind == TreeWalk::Entry::Kind::kUnknownBelow;
  const std::string key = below ? entry.path + "/" : entry.path;
  RemoveBefore(cursor, key, actions);
  while (cursor.Current() != nullptr &&
         (below ? StringStartWith(cursor.Current()->path, key) : cursor.Current()->path == key)) {
    cursor.Advance();
  }
}

/// One step of the merge of disk and index.
void CompareEntry(DocumentCursor& cursor, const TreeWalk::Entry& entry, const ComparisonActions& actions) {
  actions.examine();
  RemoveBefore(cursor, entry.path, actions);
  const bool indexed = cursor.Current() != nullptr && cursor.Current()->path == entry.path;
  if (!indexed || !actions.is_current(*cursor.Current(), entry.status)) actions.write(entry.path, entry.status);
  if (indexed) cursor.Advance();
}

}  // namespace

void CompareBelow(const std::string& folder, TreeWalk& walk, ShareIndex& index, const ComparisonActions& actions) {
  DocumentCursor cursor(folder, index);
  TreeWalk::Entry entry;
  while (walk.Next(entry)) {
    if (entry.kind == TreeWalk::Entry::Kind::kFound) {
      CompareEntry(cursor, entry, actions);
    } else {
      Keep(cursor, entry, actions);
    }
  }
  while (cursor.Current() != nullptr) {
    actions.remove(cursor.Current()->path);
    cursor.Advance();
  }
}

}  // namespace ferrox::indexd
