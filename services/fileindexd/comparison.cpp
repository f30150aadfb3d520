#include "services/fileindexd/comparison.h"

#include <optional>
#include <utility>
#include <vector>

#include "base/file_stamp.h"
#include "services/fileindexd/indexed_folders.h"
#include "wire/folder_digest.h"

namespace ferrox::indexd {

namespace {

constexpr unsigned kPageEntries = 1000;
/// After so many files that were looked at without a call of `examine` it is called.
constexpr uint64_t kExaminedAtOnce = 64;

/// Documents in the byte order of their paths, fetched by pages.
class DocumentCursor {
 public:
  using List = std::vector<IndexedEntry> (ShareIndex::*)(const std::string& folder, const std::string& after,
                                                         unsigned limit);

  DocumentCursor(std::string folder, ShareIndex& index, List list)
      : folder_(std::move(folder)), index_(index), list_(list) {
    FetchPage("");
  }

  /// Null at the end.
  const IndexedEntry* Current() const { return next_ < page_.size() ? &page_[next_] : nullptr; }

  void Advance() {
    if (++next_ == page_.size() && page_.size() == kPageEntries) FetchPage(std::string(page_.back().path));
  }

 private:
  void FetchPage(const std::string& after) {
    page_ = (index_.*list_)(folder_, after, kPageEntries);
    next_ = 0;
  }

  const std::string folder_;
  ShareIndex& index_;
  const List list_;
  std::vector<IndexedEntry> page_;
  size_t next_ = 0;
};

/// The merge of disk and index: of folders, and, in a folder that differs, of entries.
class Comparison {
 public:
  Comparison(const std::string& folder, TreeWalk& walk, ShareIndex& index, const ComparisonActions& actions)
      : walk_(walk), index_(index), actions_(actions), folders_(folder, index) {}

  void Run() {
    for (TreeWalk::Entry entry; walk_.Next(entry);) {
      switch (entry.kind) {
        case TreeWalk::Entry::Kind::kEntered:
          Enter(entry.path);
          break;
        case TreeWalk::Entry::Kind::kFound:
          Compare(entry);
          break;
        case TreeWalk::Entry::Kind::kUnknown:
          Keep(entry.path);
          break;
        case TreeWalk::Entry::Kind::kUnknownBelow:
          Leave();
          RemoveFoldersBefore(entry.path);
          folders_.SkipTree(entry.path);
          break;
      }
    }
    Leave();
    while (folders_.Current() != nullptr) RemoveFolder();
  }

 private:
  void Enter(const std::string& path) {
    Leave();
    RemoveFoldersBefore(path);
    actions_.examine();
    const FolderState* const folder = folders_.Current();
    if (folder == nullptr || folder->path != path) return;  // nothing is indexed of what is directly in it
    if (IsCurrent(*folder)) {
      walk_.SkipEntries();
    } else {
      documents_.emplace(path, index_, &ShareIndex::ListIn);
    }
    folders_.Advance();
  }

  /// What is left of the documents in the folder at hand has no file.
  void Leave() {
    for (; Document() != nullptr; documents_->Advance()) actions_.remove(Document()->path);
    documents_.reset();
  }

  /// Whether all documents directly in the folder that was just entered are current, and are those of what is there.
  bool IsCurrent(const FolderState& folder) {
    using wire::FolderDigest;
    if (!folder.digest.has_value()) return false;
    for (const UnreadContent& unread : folder.unread) {
      if (actions_.is_worth_another_try(unread)) return false;
    }
    FolderDigest digest(folders_.Seed());
    const bool examined = walk_.Examine([&](std::string_view name, const std::string& path, const struct stat& status) {
      char stamp[base::FileStamp::kMaxBytes];
      const char* const end = base::FileStamp::Of(status).Write(stamp);
      const auto mark = actions_.wants_content(path, status) ? FolderDigest::kWithContent : FolderDigest::kNone;
      digest.Add(name, {stamp, static_cast<size_t>(end - stamp)}, mark);
      if (digest.Count() % kExaminedAtOnce == 0) actions_.examine();
    });
    if (!examined || digest.Value() != *folder.digest) return false;
    actions_.are_current(digest.Count());
    return true;
  }

  const IndexedEntry* Document() const { return documents_.has_value() ? documents_->Current() : nullptr; }

  void RemoveDocumentsBefore(const std::string& path) {
    for (; Document() != nullptr && Document()->path < path; documents_->Advance()) actions_.remove(Document()->path);
  }

  void Compare(const TreeWalk::Entry& entry) {
    actions_.examine();
    RemoveDocumentsBefore(entry.path);
    const bool indexed = Document() != nullptr && Document()->path == entry.path;
    if (!indexed || !actions_.is_current(*Document(), entry.status)) actions_.write(entry.path, entry.status);
    if (indexed) documents_->Advance();
  }

  /// Leaves the document of what could not be examined as it is.
  void Keep(const std::string& path) {
    RemoveDocumentsBefore(path);
    if (Document() != nullptr && Document()->path == path) documents_->Advance();
  }

  /// Folders that the walk does not enter are gone, or are not indexed any more, with all below them.
  void RemoveFoldersBefore(const std::string& path) {
    const std::string prefix = path + "/";
    while (folders_.Current() != nullptr && folders_.Prefix() < prefix) RemoveFolder();
  }
  void RemoveFolder() {
    const std::string path = folders_.Current()->path;
    DocumentCursor documents(path, index_, &ShareIndex::List);
    for (; documents.Current() != nullptr; documents.Advance()) actions_.remove(documents.Current()->path);
    folders_.SkipTree(path);
  }

  TreeWalk& walk_;
  ShareIndex& index_;
  const ComparisonActions& actions_;
  IndexedFolders folders_;
  std::optional<DocumentCursor> documents_;  ///< of the folder at hand, when it differs
};

}  // namespace

void CompareBelow(const std::string& folder, TreeWalk& walk, ShareIndex& index, const ComparisonActions& actions) {
  Comparison(folder, walk, index, actions).Run();
}

}  // namespace ferrox::indexd
