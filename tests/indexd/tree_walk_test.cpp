// Catches files that a walk forgets, repeats, or returns out of the order that the index has its folders in.
#include "services/fileindexd/tree_walk.h"

#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <random>
#include <set>

#include <gtest/gtest.h>

#include "tests/support/temp_dir.h"

namespace ferrox::indexd {
namespace {

namespace fs = std::filesystem;

std::vector<std::string> Walk(const std::string& folder) {
  const WalkRules rules;
  TreeWalk walk(folder, rules);
  std::vector<std::string> paths;
  std::vector<std::string> examined;
  for (TreeWalk::Entry entry; walk.Next(entry);) {
    if (entry.kind == TreeWalk::Entry::Kind::kEntered) {
      const auto take = [&](std::string_view, const std::string& path, auto&) { examined.push_back(path); };
      EXPECT_TRUE(walk.Examine(take));
    } else {
      paths.push_back(entry.path);
    }
  }
  EXPECT_EQ(examined, paths);
  return paths;
}

/// What the walk must return, found and sorted in the plainest way.
std::vector<std::string> SortedListing(const std::string& folder) {
  std::set<std::pair<std::string, std::string>> names;
  for (const auto& entry : fs::recursive_directory_iterator(folder)) {
    const std::string path = entry.path().string();
    const size_t name = path.rfind('/') + 1;
    if (!entry.is_symlink()) names.emplace(path.substr(0, name), path.substr(name));
  }
  std::vector<std::string> paths;
  for (const auto& [in, name] : names) paths.push_back(in + name);
  return paths;
}

/// Names around "/" in byte order are what a walk by folders gets wrong.
void MakeRandomTree(const std::string& folder, std::mt19937& random, int depth) {
  constexpr const char* kParts[] = {"a", "a.", "a-", "a0", "a b", "a\n", "a\xFF", "a\x01", "-", "ab"};
  for (const char* part : kParts) {
    const std::string path = folder + "/" + part;
    switch (random() % 4) {
      case 0:
        test::WriteFile(path, "x");
        break;
      case 1:
        ASSERT_EQ(0, symlink("/", path.c_str()));
        break;
      case 2:
        fs::create_directory(path);
        if (depth > 0) MakeRandomTree(path, random, depth - 1);
        break;
      default:
        break;
    }
  }
}

TEST(TreeWalkTest, ReturnsWhatIsThereFolderByFolder) {
  for (unsigned seed = 1; seed <= 6; ++seed) {
    SCOPED_TRACE(seed);
    const test::TempDir folder;
    std::mt19937 random(seed);
    MakeRandomTree(folder.Path(), random, 4);
    EXPECT_EQ(SortedListing(folder.Path()), Walk(folder.Path()));
  }
}

}  // namespace
}  // namespace ferrox::indexd
