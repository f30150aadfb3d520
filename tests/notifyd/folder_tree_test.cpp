// Catches paths that a tree of folders gets wrong when folders move, vanish and come again.
#include "services/kovanotifyd/folders/folder_tree.h"

#include <map>
#include <random>
#include <set>

#include <gtest/gtest.h>

#include "base/path.h"

namespace ferrox::notifyd {
namespace {

using Id = FolderTree::Id;

std::set<std::string> PathsIn(const FolderTree& tree, Id top) {
  std::set<std::string> paths;
  for (Id child = tree.FirstChild(top); child != FolderTree::kNone; child = tree.NextSibling(child)) {
    paths.insert(tree.Path(child));
    paths.merge(PathsIn(tree, child));
  }
  return paths;
}

/// Paths and their keys, changed in the plainest way.
using Model = std::map<std::string, FolderKey>;

void AddParents(Model& model, const std::string& path) {
  for (size_t end = path.find('/', 1); end != std::string::npos; end = path.find('/', end + 1)) {
    model.emplace(path.substr(0, end), 0);
  }
}

void RemoveFrom(Model& model, const std::string& folder) {
  std::erase_if(model, [&folder](const auto& entry) { return base::IsAtOrBelow(entry.first, folder); });
}

void MoveIn(Model& model, const std::string& from, const std::string& to) {
  Model moved;
  for (const auto& [path, key] : model) {
    moved[base::IsAtOrBelow(path, from) ? to + path.substr(from.size()) : path] = key;
  }
  model = moved;
}

TEST(FolderTreeTest, IsWhatAPlainListOfPathsWouldBe) {
  std::mt19937 random(7);
  FolderTree tree;
  Model model;
  FolderKey last_key = 0;
  for (int i = 0; i < 20000; ++i) {
    std::string path;
    for (size_t depth = 1 + random() % 4; depth > 0; --depth) path += "/" + std::to_string(random() % 5);
    const size_t choice = random() % 8;
    if (choice < 5) {
      const Id id = tree.FindOrAdd(path);
      tree.SetKey(id, ++last_key);
      AddParents(model, path);
      model[path] = last_key;
      continue;
    }
    if (model.empty()) continue;
    const auto known = std::next(model.begin(), static_cast<int>(random() % model.size()));
    const std::string from = known->first;
    const Id id = tree.FindOrAdd(from);
    const FolderTree::Ref ref = tree.RefOf(id);
    if (choice == 5) {
      size_t removed = 0;
      tree.Remove(id, [&removed](Id) { ++removed; });
      const size_t before = model.size();
      RemoveFrom(model, from);
      EXPECT_EQ(removed, before - model.size());
      EXPECT_EQ(tree.Get(ref), FolderTree::kNone);
    } else if (model.count(path) == 0 && !base::IsAtOrBelow(path, from)) {
      const size_t slash = path.rfind('/');
      const Id parent = tree.FindOrAdd(path.substr(0, slash));
      AddParents(model, path);
      tree.Move(id, parent, path.substr(slash + 1));
      MoveIn(model, from, path);
    }
  }
  std::set<std::string> paths;
  uint64_t keys = 0;
  for (const auto& [path, key] : model) {
    paths.insert(path);
    if (key == 0) continue;
    ++keys;
    ASSERT_NE(tree.ByKey(key), FolderTree::kNone) << path;
    EXPECT_EQ(tree.Path(tree.ByKey(key)), path);
  }
  EXPECT_EQ(PathsIn(tree, FolderTree::kTop), paths);
  EXPECT_EQ(tree.Keys(), keys);
}

}  // namespace
}  // namespace ferrox::notifyd
