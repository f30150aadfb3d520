#include "services/kovaelasticd/store/folder_digests.h"

#include <algorithm>
#include <string_view>

#include "services/kovaelasticd/store/access_records.h"
#include "services/kovaelasticd/store/packed_fields.h"
#include "wire/fields.h"

namespace ferrox::engine {

namespace {

namespace member = fileindex::elastic;
using wire::FolderDigest;

/// What is compared of one document, as its row has it.
struct SeenDocument {
  std::string_view stamp;
  std::string_view content_type;
  int64_t version = 0;
  unsigned marks = FolderDigest::kNone;
  bool failed = false;
  bool cut = false;

  bool MayBeReadAnew() const { return (marks & FolderDigest::kWithContent) != 0 && (failed || version == 0); }
};

void AddUnread(std::vector<UnreadContent>& unread, const SeenDocument& seen) {
  const auto is_same = [&seen](const UnreadContent& known) {
    return known.version == seen.version && known.type == seen.content_type;
  };
  if (std::any_of(unread.begin(), unread.end(), is_same)) return;
  unread.push_back({std::string(seen.content_type), seen.version});
}

}  // namespace

/// Where the request goes on behind a path, that folder and those on the way to it have been returned: the way down
/// is made again.
FolderDigests::FolderDigests(Database& database, FolderTree& tree, const FieldNames& names,
                             const DigestRequest& request)
    : database_(database),
      request_(request),
      numbers_{names.NumberOf(member::k_KOVAStamp),        names.NumberOf(member::k_KOVANeedMeta),
               names.NumberOf(member::kKOVAMDContentType), names.NumberOf(member::k_KOVAExtractVersion),
               names.NumberOf(member::k_KOVAExtractError), names.NumberOf(member::k_KOVATextCut)},
      has_error_(DerivedBit(member::k_KOVAExtractError)),
      path_(request.path) {
  const int64_t top = tree.Find(path_);
  if (top == FolderTree::kNone) return;
  levels_.push_back({top, path_.size(), ""});
  first_ = request.after.empty();
  const std::string& after = request.after;
  if (first_ || !after.starts_with(path_)) return;
  int64_t folder = top;
  while (folder != FolderTree::kNone && path_.size() < after.size()) {
    const std::string name = after.substr(path_.size(), after.find('/', path_.size()) + 1 - path_.size());
    levels_.back().last_child = name;
    folder = tree.Find(path_ + name);
    if (folder != FolderTree::kNone) Enter(folder, name);
  }
}

void FolderDigests::Enter(int64_t folder, const std::string& name) {
  path_ += name;
  levels_.push_back({folder, path_.size(), ""});
}

/// Goes to the next folder, whatever is in it: the first one in this, or else the next one beside it or beside one
/// above.
bool FolderDigests::Advance() {
  if (std::exchange(first_, false)) return true;
  while (!levels_.empty()) {
    Level& level = levels_.back();
    path_.resize(level.path_bytes);
    Statement next =
        database_.Prepare("SELECT id, name FROM folders WHERE parent = ?1 AND name > ?2 ORDER BY name LIMIT 1");
    next.Bind(1, level.folder).Bind(2, std::string_view(level.last_child));
    if (next.Step()) {
      level.last_child = next.Text(1);
      const std::string name = level.last_child;
      Enter(next.Int(0), name);
      return true;
    }
    levels_.pop_back();
  }
  return false;
}

std::optional<FolderState> FolderDigests::Next() {
  while (Advance()) {
    FolderState state = Digest(levels_.back().folder);
    if (state.documents > 0) return state;
  }
  return std::nullopt;
}

FolderState FolderDigests::Digest(int64_t folder) {
  FolderState state;
  state.path = path_;
  FolderDigest digest(request_.seed);
  Statement rows =
      database_.Prepare("SELECT leaf, derived, packed, access FROM docs WHERE folder = ?1 ORDER BY leaf LIMIT ?2");
  rows.Bind(1, folder).Bind(2, request_.most_in_folder + 1);
  while (rows.Step()) AddDocument(rows, digest, state);
  state.documents = static_cast<int64_t>(digest.Count());
  documents_ += state.documents;
  if (state.documents <= request_.most_in_folder) state.digest = digest.Value();
  return state;
}

void FolderDigests::AddDocument(const Statement& row, FolderDigest& digest, FolderState& state) const {
  using Tag = PackedFields::Tag;
  SeenDocument seen;
  seen.failed = (static_cast<uint32_t>(row.Int(1)) & has_error_) != 0;
  if (row.Int(3) == AccessRecords::kNone) seen.marks |= FolderDigest::kNoAccess;
  for (PackedFields fields(row.Text(2)); fields.Next();) {
    const int64_t number = fields.Number();
    bool usual = true;
    if (number == numbers_.stamp) {
      usual = fields.IsText();
      seen.stamp = fields.Text();
    } else if (number == numbers_.need_meta) {
      usual = fields.Kind() == Tag::kTrue || fields.Kind() == Tag::kFalse;
      if (fields.Kind() == Tag::kTrue) seen.marks |= FolderDigest::kWithContent;
    } else if (number == numbers_.content_type) {
      usual = fields.IsText();
      seen.content_type = fields.Text();
    } else if (number == numbers_.version) {
      usual = fields.Kind() == Tag::kInt;
      seen.version = fields.Int();
    }
    seen.failed = seen.failed || number == numbers_.error;
    seen.cut = seen.cut || number == numbers_.cut;
    if (!usual) seen.marks |= FolderDigest::kUnusual;
  }
  if (seen.cut && !seen.failed) seen.marks |= FolderDigest::kCutWithoutReason;
  digest.Add(row.Text(0), seen.stamp, seen.marks);
  if (seen.MayBeReadAnew()) AddUnread(state.unread, seen);
}

}  // namespace ferrox::engine
