#include "services/kovaelasticd/store/path_walk.h"

namespace ferrox::engine {

namespace {

constexpr int64_t kReadAhead = 64;

/// A list in the order of `column`, from a bound (1: folder, 2: the bound, 3: the end, 4: how many).
std::string ListSql(const std::string& select, const char* of, const std::string& column, bool inclusive) {
  return select + "WHERE " + of + " = ?1 AND " + column + (inclusive ? " >= ?2 AND " : " > ?2 AND ") + column +
         " < ?3 ORDER BY " + column + " LIMIT ?4";
}

}  // namespace

PathWalk::PathWalk(Database& database, FolderTree& tree, const std::string& prefix, std::string after)
    : database_(database), after_(std::move(after)), path_(FolderTree::FolderOf(prefix)) {
  const int64_t folder = tree.Find(path_);
  const bool is_behind = after_ > path_ && !after_.starts_with(path_);  // all that is in the folder comes before
  if (folder == FolderTree::kNone || is_behind) return;
  const std::string begin(FolderTree::LeafOf(prefix));
  Enter(folder, begin, EndOfPrefix(begin));
}

/// Names from `begin` on, but none that `after_` is behind. A folder through which the way to `after_` leads is
/// entered.
void PathWalk::Enter(int64_t folder, const std::string& begin, std::string end) {
  Level level{folder, path_.size(), {begin}, {begin}, std::move(end)};
  if (after_.starts_with(path_)) {
    const std::string rest = after_.substr(path_.size());
    const size_t slash = rest.find('/');
    if (rest >= begin) level.documents = {rest, false};
    const std::string way = slash == std::string::npos ? rest : rest.substr(0, slash + 1);
    if (way >= begin) level.folders = {way, slash != std::string::npos};
  }
  levels_.push_back(std::move(level));
  documents_.clear();
  folders_.clear();
}

void PathWalk::Leave() {
  levels_.pop_back();
  if (!levels_.empty()) path_.resize(levels_.back().path_bytes);
  documents_.clear();
  folders_.clear();
}

void PathWalk::Fill(Level& level) {
  static const std::string documents_sql[] = {ListSql(kSelectRow, "folder", "leaf", false),
                                              ListSql(kSelectRow, "folder", "leaf", true)};
  static const std::string folders_sql[] = {ListSql("SELECT name, id FROM folders ", "parent", "name", false),
                                            ListSql("SELECT name, id FROM folders ", "parent", "name", true)};
  const auto read = [&](const std::string(&sql)[2], const Bound& bound, const auto& take) {
    Statement statement = database_.Prepare(sql[bound.inclusive ? 1 : 0]);
    statement.Bind(1, level.folder).Bind(2, std::string_view(bound.name)).Bind(4, kReadAhead);
    BindEnd(statement, 3, level.end);
    int64_t count = 0;
    for (; statement.Step(); ++count) take(statement);
    return count < kReadAhead;
  };
  if (documents_.empty() && !level.documents_done) {
    level.documents_done =
        read(documents_sql, level.documents, [&](const Statement& row) { documents_.push_back(ReadRow(row, path_)); });
    if (!documents_.empty()) level.documents = {std::string(FolderTree::LeafOf(documents_.back().row.path)), false};
  }
  if (folders_.empty() && !level.folders_done) {
    level.folders_done = read(folders_sql, level.folders, [&](const Statement& row) {
      folders_.emplace_back(std::string(row.Text(0)), row.Int(1));
    });
    if (!folders_.empty()) level.folders = {folders_.back().first, false};
  }
}

bool PathWalk::FolderIsNext() const {
  if (folders_.empty()) return false;
  return documents_.empty() || folders_.front().first < FolderTree::LeafOf(documents_.front().row.path);
}

bool PathWalk::Next() {
  while (!levels_.empty()) {
    Level& level = levels_.back();
    Fill(level);
    if (FolderIsNext()) {
      const auto [name, folder] = folders_.front();
      // What was read ahead is dropped on the way down, and read again from here.
      level.folders = {name, false};
      level.folders_done = level.folders_done && folders_.size() == 1;
      if (!documents_.empty()) {
        level.documents = {std::string(FolderTree::LeafOf(documents_.front().row.path)), true};
        level.documents_done = false;
      }
      path_ += name;
      Enter(folder, "", "");
      continue;
    }
    if (!documents_.empty()) {
      document_ = std::move(documents_.front());
      documents_.pop_front();
      return true;
    }
    Leave();
  }
  return false;
}

}  // namespace ferrox::engine
