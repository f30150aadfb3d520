#include "services/kovaelasticd/store/folder_tree.h"

#include <limits>

#include "services/kovaelasticd/store/store_rows.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

template <typename Next>
int64_t FolderTree::Descend(std::string_view folder_path, Next next) {
  int64_t folder = kTop;
  if (!folder_path.empty()) folder_path.remove_prefix(1);  // it begins with the name of the top
  while (folder != kNone && !folder_path.empty()) {
    const std::string_view name = folder_path.substr(0, folder_path.find('/') + 1);
    folder = next(folder, name);
    folder_path.remove_prefix(name.size());
  }
  return folder;
}

int64_t FolderTree::Find(std::string_view folder_path) {
  return Descend(folder_path, [this](int64_t parent, std::string_view name) { return ChildOf(parent, name); });
}

int64_t FolderTree::Make(std::string_view folder_path) {
  return Descend(folder_path, [this](int64_t parent, std::string_view name) {
    const int64_t there = ChildOf(parent, name);
    return there != kNone ? there : AddChild(parent, name);
  });
}

int64_t FolderTree::ChildOf(int64_t parent, std::string_view name) {
  const auto kept = children_.find({parent, std::string(name)});
  if (kept != children_.end()) return kept->second;
  Statement statement = database_.Prepare("SELECT id, access FROM folders WHERE parent = ?1 AND name = ?2");
  if (!statement.Bind(1, parent).Bind(2, name).Step()) return kNone;
  const int64_t folder = statement.Int(0);
  Keep(folder, {parent, std::string(name), statement.Int(1)});
  return folder;
}

int64_t FolderTree::AddChild(int64_t parent, std::string_view name) {
  const int64_t access = AccessOfDocument(parent, name).value_or(0);
  Statement statement = database_.Prepare("INSERT INTO folders(parent, name, access) VALUES(?1, ?2, ?3)");
  statement.Bind(1, parent).Bind(2, name).Bind(3, access).Run();
  const int64_t folder = sqlite3_last_insert_rowid(database_.Handle());
  Keep(folder, {parent, std::string(name), access});
  return folder;
}

/// The record of the document that is the folder's own; nothing where there is none.
std::optional<int64_t> FolderTree::AccessOfDocument(int64_t parent, std::string_view name) {
  Statement statement = database_.Prepare("SELECT access FROM docs WHERE folder = ?1 AND leaf = ?2 AND kind = ?3");
  statement.Bind(1, parent).Bind(2, name.substr(0, name.size() - 1)).Bind(3, int64_t{kFolder});
  return statement.Step() ? std::optional(statement.Int(0)) : std::nullopt;
}

FolderTree::Node FolderTree::NodeOf(int64_t folder) {
  const auto kept = nodes_.find(folder);
  if (kept != nodes_.end()) return kept->second;
  Statement statement = database_.Prepare("SELECT parent, name, access FROM folders WHERE id = ?1");
  if (!statement.Bind(1, folder).Step()) database_.Fail(SQLITE_CORRUPT);
  Node node = {statement.Int(0), std::string(statement.Text(1)), statement.Int(2)};
  Keep(folder, node);
  return node;
}

std::string FolderTree::PathOf(int64_t folder) {
  constexpr size_t kPathMaxBytes = 1 << 16;  // longer than any path; only a damaged file has a circle
  std::string reversed;
  while (folder != kTop) {
    if (folder == kGone) return "";
    const Node node = NodeOf(folder);
    reversed.append(node.name.rbegin(), node.name.rend());
    if (reversed.size() > kPathMaxBytes) database_.Fail(SQLITE_CORRUPT);
    folder = node.parent;
  }
  return "/" + std::string(reversed.rbegin(), reversed.rend());
}

std::pair<int64_t, std::string> FolderTree::PlaceOf(int64_t folder) {
  Node node = NodeOf(folder);
  return {node.parent, std::move(node.name)};
}

std::vector<int64_t> FolderTree::AtAndBelow(int64_t folder) {
  return *AtAndBelow(folder, std::numeric_limits<size_t>::max());
}

std::optional<std::vector<int64_t>> FolderTree::AtAndBelow(int64_t folder, size_t most) {
  std::vector<int64_t> folders = {folder};
  Statement below = database_.Prepare("SELECT id FROM folders WHERE parent = ?1");
  for (size_t i = 0; i < folders.size(); ++i) {
    for (below.Bind(1, folders[i]); below.Step();) {
      if (folders.size() >= most) return std::nullopt;
      folders.push_back(below.Int(0));
    }
    below.Reset();
  }
  return folders;
}

std::vector<int64_t> FolderTree::ChildrenOf(int64_t folder, const std::string& begin) {
  std::vector<int64_t> children;
  Statement statement = database_.Prepare("SELECT id FROM folders WHERE parent = ?1 AND name >= ?2 AND name < ?3");
  const std::string end = EndOfPrefix(begin);
  BindEnd(statement.Bind(1, folder).Bind(2, std::string_view(begin)), 3, end);
  while (statement.Step()) children.push_back(statement.Int(0));
  return children;
}

bool FolderTree::IsAtOrBelow(int64_t folder, int64_t other) {
  constexpr int kDepthMax = 1 << 15;  // deeper than any path; only a damaged file has a circle
  for (int depth = 0; depth < kDepthMax && folder > kNone; ++depth) {
    if (folder == other) return true;
    folder = NodeOf(folder).parent;
  }
  return false;
}

void FolderTree::Move(int64_t folder, std::string_view new_path) {
  const std::string_view above = FolderOf(new_path.substr(0, new_path.size() - 1));
  const int64_t parent = Make(above);
  Node node = NodeOf(folder);
  const std::string_view name = new_path.substr(above.size());
  const int64_t access = AccessOfDocument(parent, name).value_or(node.access);
  Statement statement = database_.Prepare("UPDATE folders SET parent = ?2, name = ?3, access = ?4 WHERE id = ?1");
  statement.Bind(1, folder).Bind(2, parent).Bind(3, name).Bind(4, access).Run();
  const int64_t parent_before = node.parent;
  children_.erase({node.parent, std::move(node.name)});
  Keep(folder, {parent, std::string(name), access});
  Prune(parent_before);
}

void FolderTree::SetAccess(int64_t folder, int64_t access) {
  Node node = NodeOf(folder);
  if (node.access == access) return;
  database_.Prepare("UPDATE folders SET access = ?2 WHERE id = ?1").Bind(1, folder).Bind(2, access).Run();
  node.access = access;
  Keep(folder, std::move(node));
}

void FolderTree::TakeOut(int64_t folder, std::string_view gone_name) {
  const int64_t parent = NodeOf(folder).parent;
  Statement statement = database_.Prepare("UPDATE folders SET parent = ?2, name = ?3 WHERE id = ?1");
  statement.Bind(1, folder).Bind(2, kGone).Bind(3, gone_name).Run();
  Drop(folder);
  Prune(parent);
}

std::vector<int64_t> FolderTree::GoneAfter(Database& database, const std::string& gone_name) {
  std::vector<int64_t> folders;
  Statement statement = database.Prepare("SELECT id FROM folders WHERE parent = ?1 AND name > ?2 ORDER BY name");
  statement.Bind(1, kGone).Bind(2, std::string_view(gone_name));
  while (statement.Step()) folders.push_back(statement.Int(0));
  return folders;
}

std::string FolderTree::NewestGone(Database& database) {
  Statement statement = database.Prepare("SELECT name FROM folders WHERE parent = ?1 ORDER BY name DESC LIMIT 1");
  return statement.Bind(1, kGone).Step() ? std::string(statement.Text(0)) : "";
}

bool FolderTree::IsEmpty(int64_t folder) {
  Statement document = database_.Prepare("SELECT 1 FROM docs WHERE folder = ?1 LIMIT 1");
  if (document.Bind(1, folder).Step()) return false;
  Statement child = database_.Prepare("SELECT 1 FROM folders WHERE parent = ?1 LIMIT 1");
  return !child.Bind(1, folder).Step();
}

void FolderTree::Prune(int64_t folder) {
  while (folder != kTop && IsEmpty(folder)) {
    const int64_t parent = NodeOf(folder).parent;
    database_.Prepare("DELETE FROM folders WHERE id = ?1").Bind(1, folder).Run();
    Drop(folder);
    folder = parent;
  }
}

/// Of what was kept, what concerns one folder.
void FolderTree::Drop(int64_t folder) {
  const auto kept = nodes_.find(folder);
  if (kept == nodes_.end()) return;
  children_.erase({kept->second.parent, std::move(kept->second.name)});
  nodes_.erase(kept);
}

void FolderTree::Keep(int64_t folder, Node node) {
  if (nodes_.size() >= kKeptMax) Forget();
  children_[{node.parent, node.name}] = folder;
  nodes_.insert_or_assign(folder, std::move(node));
}

void FolderTree::Forget() {
  nodes_.clear();
  children_.clear();
}

}  // namespace ferrox::engine
