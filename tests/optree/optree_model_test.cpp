// Catches sequences of events that fold into operations unlike the plain model of the rules says.
#include <algorithm>
#include <random>

#include <gtest/gtest.h>

#include "common/new_class.h"
#include "fuzz/queue_model.h"
#include "tests/support/library_test.h"
#include "tests/support/queue_lines.h"

namespace ferrox::test {

namespace {

using fileindex::Event;
using fileindex::OPTree;

/// Every kind of line for `path`, alone and combined, and renames to it from each of `others`, itself among them.
std::vector<std::string> LinesFor(const std::string& path, const std::vector<std::string>& others) {
  std::vector<std::string> lines;
  for (const uint32_t event : {0x40u, 0x4u, 0x2u, 0x80u, 0x10000u, 0x6u, 0x10080u}) lines.push_back(Line(event, path));
  for (const uint32_t event : {0x40u, 0x84u}) lines.push_back(Line(event, path, "", true));
  lines.push_back(UpdateCfg(path, "audio"));
  for (const std::string& other : others) lines.push_back(Line(0x100u, path, other));
  for (const uint32_t event : {0x104u, 0x10102u}) lines.push_back(Line(event, path, others.front()));
  return lines;
}

std::vector<std::shared_ptr<Event>> EventsOn(const std::vector<std::string>& paths) {
  std::vector<std::shared_ptr<Event>> events;
  for (const std::string& path : paths) {
    for (const std::string& line : LinesFor(path, paths)) events.push_back(newClass<Event>(line));
  }
  return events;
}

// Sanitizers look at how memory is used, which a part of all sequences shows; each is slow with them.
#ifdef FERROX_SANITIZED
constexpr int kStride = 8;
#else
constexpr int kStride = 1;
#endif

class OPTreeModelTest : public testing::Test {
 protected:
  OPTreeModelTest() { WriteFile(dir_ / "empty", ""); }

  testing::AssertionResult Agree(const std::vector<std::shared_ptr<Event>>& events) {
    OPTree tree(dir_ / "empty");
    ListModel model;
    for (const auto& event : events) {
      model.Insert(*event);
      (void)FailureOf([&] { tree.InsertEvent(event); });
    }
    const std::string got = TextOf(tree);
    if (got == model.Text()) return testing::AssertionSuccess();
    auto failure = testing::AssertionFailure();
    for (const auto& event : events) {
      failure << std::hex << event->event << (event->is_dir ? " dir " : " ") << event->path_old << " -> " << event->path
              << "\n";
    }
    return failure << "got\n" << got << "\nexpected\n" << model.Text();
  }

  TempDir dir_;
  const unsigned seed_ = std::random_device()();
  const testing::ScopedTrace trace_{__FILE__, __LINE__, "seed " + std::to_string(seed_)};
  std::mt19937 random_{seed_};
};

TEST_F(OPTreeModelTest, EverySequenceOfUpToThreeEventsOnThreePaths) {
  for (const auto& paths : {std::vector<std::string>{"/a", "/a/b", "/c"}, {"/a/b", "/a/b/b", "/a"}}) {
    const auto events = EventsOn(paths);
    for (const auto& first : events) {
      ASSERT_TRUE(Agree({first}));
      for (const auto& second : events) {
        ASSERT_TRUE(Agree({first, second}));
        for (size_t third = 0; third < events.size(); third += kStride) {
          ASSERT_TRUE(Agree({first, second, events[third]}));
        }
      }
    }
  }
}

TEST_F(OPTreeModelTest, LongRandomSequences) {
  const auto events = EventsOn({"/a", "/a/b", "/a/b/c", "/a/d", "/e", "/e/b", "/e/b/f"});
  for (int round = 0; round < 2000 / kStride; ++round) {
    std::vector<std::shared_ptr<Event>> sequence;
    for (int i = 0; i < 20; ++i) sequence.push_back(events[random_() % events.size()]);
    ASSERT_TRUE(Agree(sequence));
  }
}

TEST_F(OPTreeModelTest, RandomSequencesAboveManyIdleNodes) {
  std::vector<std::shared_ptr<Event>> idle;
  for (int i = 0; i < 10100; ++i) {
    idle.push_back(newClass<Event>(Modify("/a/b/" + std::to_string(i % 101) + "/" + std::to_string(i))));
  }
  idle.push_back(newClass<Event>(Reindex("/a/b")));
  const auto events = EventsOn({"/a", "/a/b/1/1", "/a/b", "/a/d", "/e", "/e/b/1", "/e/b"});
  for (int round = 0; round < std::max(1, 4 / kStride); ++round) {
    std::vector<std::shared_ptr<Event>> sequence = idle;
    while (sequence.size() < idle.size() + 20) {
      const auto& event = events[random_() % events.size()];
      // Of renames only those that a kernel makes.
      if (event->path.rfind(event->path_old, 0) == 0 && !event->path_old.empty()) continue;
      if (event->path_old.rfind(event->path, 0) == 0) continue;
      sequence.push_back(event);
    }
    ASSERT_TRUE(Agree(sequence));
  }
}

}  // namespace

}  // namespace ferrox::test
