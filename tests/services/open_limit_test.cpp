// Catches folders that do not answer and take all the threads with them.
#include "services/support/open_limit.h"

#include <gtest/gtest.h>

#include "common/error.h"
#include "common/json_util.h"

namespace ferrox::test {
namespace {

using services::OpenLimit;

std::string Refusal(OpenLimit& limit, const std::string& root) try {
  const OpenLimit::Turn turn(limit, root);
  return "";
} catch (const Error& error) {
  return error.what();
}

TEST(OpenLimitTest, AFolderThatDoesNotAnswerHoldsFewAndOthersGoOn) {
  OpenLimit limit({16, 2, std::chrono::milliseconds(0)});  // each opening takes long at once
  {
    const OpenLimit::Turn first(limit, "/away");
    EXPECT_EQ("", Refusal(limit, "/away"));
    const OpenLimit::Turn second(limit, "/away");
    EXPECT_NE(std::string::npos, Refusal(limit, "/away").find("/away does not answer"));
    EXPECT_EQ("", Refusal(limit, "/here"));
    EXPECT_EQ("[\"/away\"]", toString(limit.Held()));
  }
  EXPECT_EQ("", Refusal(limit, "/away")) << "it answers again";
  EXPECT_EQ("[]", toString(limit.Held()));
}

TEST(OpenLimitTest, ThereAreNeverMoreThanSoMany) {
  OpenLimit limit({2, 2, std::chrono::hours(1)});
  const OpenLimit::Turn first(limit, "/a");
  EXPECT_EQ("", Refusal(limit, "/a"));
  const OpenLimit::Turn second(limit, "/b");
  EXPECT_NE("", Refusal(limit, "/c"));
  EXPECT_EQ("[]", toString(limit.Held())) << "none has taken long";
  OpenLimit of_each({3, 2, std::chrono::hours(1), 1});
  const OpenLimit::Turn only(of_each, "/a");
  EXPECT_NE("", Refusal(of_each, "/a"));
  EXPECT_EQ("", Refusal(of_each, "/b"));
}

}  // namespace
}  // namespace ferrox::test
