// Catches files that a walk forgets, repeats, or returns out of the order that the index has.
#include "services/fileindexd/tree_walk.h"

#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <random>

#include <gtest/gtest.h>

#include "tests/support/temp_dir.h"

namespace ferrox::indexd {
namespace {

namespace fs = std::filesystem;

std::vector<std::string> Walk(const std::string& folder) {
  const WalkRules rules;
  TreeWalk walk(folder, rules);
  std::vector<std::string> paths;
  for (TreeWalk::Entry entry; walk.Next(entry);) paths.push_back(entry.path);
  return paths;
}

/// What the walk must return, found and sorted in the plainest way.
std::vector<std::string> SortedListing(const std::string& folder) {
  std::vector<std::string> paths;
  for (const auto& entry : fs::recursive_directory_iterator(folder)) {
    if (!entry.is_symlink()) paths.push_back(entry.path().string());
  }
  std::sort(paths.begin(), paths.end());
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

TEST(TreeWalkTest, ReturnsWhatIsThereInByteOrderOfFullPaths) {
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
