// Catches examples of the folding that change, and trees that bad lines, deep paths or their end destroy.
#include <sstream>

#include <gtest/gtest.h>

#include "common/new_class.h"
#include "fileindex/util.h"
#include "tests/support/library_test.h"
#include "tests/support/queue_lines.h"

namespace ferrox::test {

namespace {

using namespace fileindex;

/// The operations that the lines, the last one without its newline, come to, one a line.
std::string Fold(const std::vector<std::string>& lines) {
  const TempDir dir;
  std::string queue;
  for (const std::string& line : lines) queue += (queue.empty() ? "" : "\n") + line;
  WriteFile(dir / "queue", queue);
  OPTree tree(dir / "queue");
  std::ostringstream text;
  tree.ProcessOP([&text](std::shared_ptr<OP> op) { text << op << "\n"; });
  return text.str();
}

TEST(OPTreeTest, Folding) {
  const struct {
    const char* claim;
    std::vector<std::string> lines;
    const char* operations;
  } kCases[] = {
      {"changes of one file are one upsert", {Create("/v/f"), Modify("/v/f"), Attr("/v/f")}, "[02] /v/f\n"},
      {"a created file may have been indexed before", {Create("/v/f"), Delete("/v/f")}, "[01] /v/f\n"},
      {"flags add up",
       {UpdateCfg("/v", "audio"), UpdateCfg("/v", "video"), UpdateCfg("/v", "audio", false)},
       "[04] /v, data={\"audio\":true,\"document\":false,\"photo\":false,\"video\":true}\n"},
      {"what is no flags adds none",
       {Line(EVENT_UPDATE_CFG, "/v", "", true, "audio"), UpdateCfg("/v", "photo"),
        Line(EVENT_UPDATE_CFG, "/v", "", true, 3)},
       "[04] /v, data={\"audio\":false,\"document\":false,\"photo\":true,\"video\":false}\n"},
      {"a reindex covers what lies below",
       {Create("/v/a/x"), Rename("/v/o", "/v/a/r"), Create("/v/a/y/z"), Create("/v/ab"), Reindex("/v/a")},
       "[05] /v/o -> /v/a/r\n[02] /v/ab\n[06] /v/a\n"},
      {"a folder's rename takes all but deletes along",
       {Modify("/a/b/f"), Delete("/a/b/g"), Rename("/a", "/z")},
       "[02] /z/b/f\n[01] /a/b/g\n[05] /a -> /z\n"},
      {"nothing counts beside a crash", {Create("/v/a"), Crash("/v"), Create("/v/b")}, "[07] \n"},
      {"a rename into itself ends", {Modify("/a/f"), Rename("/a", "/a/b")}, "[02] /a/b/f\n[05] /a -> /a/b\n"},
  };
  const LogCapture log;
  for (const auto& test : kCases) EXPECT_EQ(Fold(test.lines), test.operations) << test.claim;
}

TEST(OPTreeTest, BadLinesAreLoggedAndSkipped) {
  const LogCapture log;
  const std::string huge = Create("/" + std::string(2 * kQueueLineMaxBytes, 'x'));
  EXPECT_EQ(Fold({"{half", Create("/v/a"), huge, std::string(50, '\0'), Create("/v/b/"), Create("v"),
                  Rename("", "/v/c"), "", Create("/v/d")}),
            "[02] /v/a\n[02] /v/d\n");
  for (const char* text : {
           "InsertEvent failed, event_raw={half, code=906, reason=Malformed event_raw: {half",
           "xxx..., code=906, reason=Malformed event_raw: {",
           R"(event_raw=\x00\x00)",
           "code=9999, reason=GetNodeByPath failed, path=/v/b/",
           "(GetNodeByPath) Failed [",
           "event_raw=, code=906",
       }) {
    EXPECT_TRUE(LogCapture::Contains(text)) << text;
  }
  EXPECT_FALSE(LogCapture::Contains("[err:"));
}

TEST(OPTreeTest, MissingQueue) {
  const LogCapture log;
  EXPECT_EQ(FailureOf([] { OPTree("/nowhere/queue"); }), "502 Failed to open queue, reason=No such file or directory");
  EXPECT_TRUE(LogCapture::Contains(" (BuildTree) Failed [!input_stream], reason: Failed to open queue"));
}

TEST(OPTreeTest, LinesAreLoggedAtTheDebugLevelOnly) {
  const LogCapture log;
  Fold({Create("/v/a")});
  EXPECT_TRUE(LogCapture::Lines().empty());
  log_level = 7;
  Fold({Create("/v/a")});
  log_level = 0;
  EXPECT_TRUE(LogCapture::Contains(" Got event: {\"data\":null,\"event\":64"));
}

class OPTreeNodesTest : public testing::Test {
 protected:
  OPTreeNodesTest() { WriteFile(dir_ / "empty", ""); }

  TempDir dir_;
};

TEST_F(OPTreeNodesTest, OnlyNormalizedPathsAreFoundButAllAreMade) {
  const LogCapture log;
  OPTree tree(dir_ / "empty");
  for (const char* path : {"", "/", "a", "/a/", "/a//b", "//c"}) EXPECT_THROW(tree.GetNodeByPath(path), Error) << path;
  ASSERT_EQ(tree.root->children.size(), 2u);
  EXPECT_EQ(tree.root->children[0]->children[0]->GetPath(), "/a/b");
  EXPECT_EQ(tree.GetNodeByPath("/a/b"), tree.root->children[0]->children[0]);
  EXPECT_EQ(tree.root->GetPath(), "");
}

TEST_F(OPTreeNodesTest, KeptOperationsOutliveTheTree) {
  std::shared_ptr<OP> kept;
  {
    WriteQueue(dir_ / "queue", {Create("/v/s/a"), Create("/v/s/b")});
    OPTree tree(dir_ / "queue");
    tree.ProcessOP([&kept](std::shared_ptr<OP> op) { kept = op; });
  }
  EXPECT_EQ(kept->node->GetPath(), "/v/s/b");
  const std::weak_ptr<OPNode> root = kept->node->parent->parent->parent;
  kept.reset();
  EXPECT_TRUE(root.expired());
}

TEST_F(OPTreeNodesTest, DeepPathsNeedNoStack) {
  std::string deep;
  for (int i = 0; i < 100000; ++i) deep += "/d";
  WriteQueue(dir_ / "queue", {Create(deep), Rename("/d", "/d/d"), Rename("/d", "/e"), Reindex("/e")});
  std::shared_ptr<OPNode> kept;
  {
    OPTree tree(dir_ / "queue");
    tree.ProcessOP([&kept](std::shared_ptr<OP> op) { kept = op->node; });
    kept = tree.GetNodeByPath(deep);
  }
  EXPECT_EQ(kept->GetPath(), deep);
}

TEST_F(OPTreeNodesTest, TextForms) {
  OPTree tree(dir_ / "empty");
  const auto node = tree.GetNodeByPath("/v/a");
  tree.InsertEvent(newClass<Event>(Create("/v/a")));
  tree.InsertEvent(newClass<Event>(Rename("/v/o", "/v/a")));
  std::ostringstream text;
  text << node;
  EXPECT_EQ(text.str(), "Node[a]: \n  [00] /v/a\n  [05] /v/o -> /v/a\n");
}

}  // namespace

}  // namespace ferrox::test
