// Catches a comparison by digests that passes over a document that is not current, or sees documents of folders that
// are as they ought to be.
#include "services/fileindexd/comparison.h"

#include <filesystem>
#include <memory>

#include <gtest/gtest.h>

#include "services/fileindexd/document_writer.h"
#include "tests/indexd/fake_index.h"
#include "tests/support/temp_dir.h"

namespace ferrox::indexd {
namespace {

namespace fs = std::filesystem;

class ComparisonTest : public testing::Test {
 protected:
  ComparisonTest() {
    for (const char* folder : {"/a", "/a/b", "/a/b-", "/a/b/c", "/d"}) {
      fs::create_directories(root_ + folder);
      for (const char* name : {"/x", "/y"}) test::WriteFile(root_ + folder + name, "text");
    }
    for (const auto& entry : fs::recursive_directory_iterator(root_)) {
      index_.Upsert(entry.path(), entry.is_regular_file());
    }
  }

  /// What is to be done, and below it how many lists of documents were asked for.
  std::string Compare() {
    std::string done;
    uint64_t current = 0;
    ComparisonActions actions;
    actions.is_current = [&](const IndexedEntry& indexed, const struct stat& status) {
      const bool is_current = indexed.stamp == KOVA::CONTENT_EXTRACT::Stamp(status) && indexed.has_access &&
                              indexed.with_content == S_ISREG(status.st_mode);
      current += is_current ? 1 : 0;
      return is_current;
    };
    actions.wants_content = [](const std::string&, const struct stat& status) { return S_ISREG(status.st_mode); };
    actions.is_worth_another_try = &DocumentWriter::IsWorthAnotherTry;
    actions.are_current = [&](uint64_t documents) { current += documents; };
    actions.write = [&](const std::string& path, const struct stat&) { done += "write " + Short(path) + "\n"; };
    actions.remove = [&](const std::string& path) { done += "remove " + Short(path) + "\n"; };
    const WalkRules rules;
    TreeWalk walk(root_, rules);
    index_.lists = 0;
    CompareBelow(root_, walk, index_, actions);
    return done + std::to_string(current) + " current, " + std::to_string(index_.lists) + " lists";
  }
  std::string Short(const std::string& path) const { return path.substr(root_.size()); }
  FakeIndex::Document& Document(const char* path) { return index_.documents.at(root_ + path); }

  test::TempDir folder_;
  const std::string root_ = folder_.Path();
  test::FakeIndex index_;
};

TEST_F(ComparisonTest, OneDifferenceIsFoundAndNothingElseIsListed) {
  ASSERT_EQ(Compare(), "15 current, 0 lists");
  const auto check = [this](const std::string& expected, const std::function<void()>& change) {
    const auto before = index_.documents;
    change();
    EXPECT_EQ(Compare(), expected);
    index_.documents = before;
  };
  const std::string write = "write /a/b/c/x\n14 current, 1 lists";
  check(write, [this] { Document("/a/b/c/x").stamp += "0"; });
  check("write /a/b/c/x\nwrite /a/b/c/y\n13 current, 1 lists",
        [this] { std::swap(Document("/a/b/c/x"), Document("/a/b/c/y")); });
  check(write, [this] { Document("/a/b/c/x").access = ""; });
  check(write, [this] { Document("/a/b/c/x").with_content = false; });
  check("write /a/b\n14 current, 1 lists", [this] { Document("/a/b").with_content = true; });
  check(write, [this] { index_.documents.erase(root_ + "/a/b/c/x"); });
  check("write /a/b/c/x\nremove /a/b/c/x2\n14 current, 1 lists", [this] {
    auto node = index_.documents.extract(root_ + "/a/b/c/x");
    node.key() += "2";
    index_.documents.insert(std::move(node));
  });
  check("remove /a/b/0\n15 current, 1 lists", [this] { index_.documents[root_ + "/a/b/0"] = Document("/d/x"); });
  check("remove /a/b/c/x/y\n15 current, 1 lists",
        [this] { index_.documents[root_ + "/a/b/c/x/y"] = Document("/d/x"); });
}

TEST_F(ComparisonTest, FoldersThatCameOrWentAreWrittenOrRemovedWhole) {
  fs::rename(root_ + "/a/b", root_ + "/c");
  EXPECT_EQ(Compare(),
            "write /a\nwrite /c\n"
            "remove /a/b\n"
            "remove /a/b/c\nremove /a/b/c/x\nremove /a/b/c/y\nremove /a/b/x\nremove /a/b/y\n"
            "write /c/c\nwrite /c/x\nwrite /c/y\nwrite /c/c/x\nwrite /c/c/y\n8 current, 3 lists");
}

}  // namespace
}  // namespace ferrox::indexd
