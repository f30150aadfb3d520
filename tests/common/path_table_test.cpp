// Catches paths found below a folder whose name they merely begin with, and deep paths that cost too much.
#include "base/path_table.h"

#include <map>
#include <random>

#include <gtest/gtest.h>

#include "base/path.h"

namespace ferrox::fileindex {

namespace {

size_t hashed_bytes = 0;

struct CountingHash {
  size_t operator()(std::string_view name) const {
    hashed_bytes += name.size();
    return std::hash<std::string_view>()(name);
  }
};

}  // namespace

TEST(PathTest, AFolderHoldsWhatFollowsItByWholeNames) {
  for (const char* path : {"/v/a", "/v/a/", "/v/a/b"}) EXPECT_TRUE(base::IsAtOrBelow(path, "/v/a")) << path;
  for (const char* path : {"/v/ab", "/v", "/", ""}) EXPECT_FALSE(base::IsAtOrBelow(path, "/v/a")) << path;
  for (const char* root : {"/", ""}) EXPECT_TRUE(base::IsBelow("/v", root) && base::IsAtOrBelow(root, root)) << root;
  EXPECT_FALSE(base::IsBelow("/", "/") || base::IsBelow("/v/a", "/v/a") || base::IsAtOrBelow("", "/"));
}

TEST(PathTableTest, ValuesAreFoundFromTheirPathAndBelow) {
  std::mt19937 random(7);
  base::PathTable<int> table;
  std::map<std::string, int> model;
  for (int step = 0; step < 20000; ++step) {
    std::string path;
    for (unsigned length = random() % 7; length > 0; --length) path += "//ab"[random() % 4];
    const auto is_odd = [](int value) { return value % 2 == 1; };
    if (random() % 3 == 0) {
      table.Insert(path, step);
      (void)model.try_emplace(path, step);
    } else if (random() % 2 == 0) {
      table.Erase(path);
      (void)model.erase(path);
    } else if (random() % 100 == 0) {
      table.EraseIf(is_odd);
      (void)std::erase_if(model, [&](const auto& entry) { return is_odd(entry.second); });
    }
    std::vector<int> at_or_above;
    for (size_t end = path.size() + 1; end-- > 0;) {
      if (end != path.size() && path[end] != '/') continue;
      if (const auto found = model.find(path.substr(0, end)); found != model.end())
        at_or_above.push_back(found->second);
    }
    std::vector<int> visited;
    table.VisitUpwards(path, [&](int value) { return visited.push_back(value), false; });
    ASSERT_EQ(visited, at_or_above) << path;
    ASSERT_EQ(table.Find(path) != nullptr, model.count(path) == 1) << path;
    ASSERT_EQ(table.Size(), model.size());
  }
}

TEST(PathTableTest, APathCostsItsBytesHoweverDeepItIs) {
  std::string path;
  for (int depth = 0; depth < 2000; ++depth) path += "/d";
  base::PathTable<int, CountingHash> table;
  size_t bytes = 0;
  for (; !path.empty(); path.resize(path.size() - 2)) {
    table.VisitUpwards(path, [](int) { return false; });
    table.Insert(path, 0);
    bytes += path.size();
  }
  EXPECT_LT(hashed_bytes, 4 * bytes);
}

}  // namespace ferrox::fileindex
