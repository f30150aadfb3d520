// Catches words and options that are taken for something else, and figures that people would misread.
#include "cli/command.h"

#include <gtest/gtest.h>

#include "cli/explain.h"
#include "cli/format.h"
#include "cli/progress.h"
#include "common/subject_error.h"

namespace ferrox::cli {
namespace {

const Command kCommand = {"do",
                          "WORD [WORD]",
                          {{"--limit", "N", ""}, {"--json", nullptr, ""}, {"--sort", "name|date", ""}},
                          "Does.",
                          nullptr};

TEST(CommandTest, OptionsAndWordsMayBeMixed) {
  const Arguments arguments = ParseArguments(kCommand, {"a", "--limit", "5", "--json", "--", "--b"});
  EXPECT_EQ((std::vector<std::string>{"a", "--b"}), arguments.words);
  EXPECT_EQ(5, arguments.Number("--limit", 10, 1, 100));
  EXPECT_TRUE(arguments.Has("--json"));
  EXPECT_EQ("x", ParseArguments(kCommand, {"--limit=x", "a"}).Get("--limit"));
}

TEST(CommandTest, WrongUsageIsRefused) {
  const std::vector<std::vector<std::string>> wrong = {
      {}, {"a", "b", "c"}, {"a", "--unknown"}, {"a", "--limit"}, {"a", "--json=1"}, {"a", "--sort=nam"}};
  for (const auto& given : wrong) EXPECT_THROW(ParseArguments(kCommand, given), UsageError);
  for (const char* number : {"", "x", "5x", "0", "101", "99999999999999999999"}) {
    const Arguments arguments = ParseArguments(kCommand, {"a", "--limit", number});
    EXPECT_THROW(arguments.Number("--limit", 10, 1, 100), UsageError) << number;
  }
}

TEST(ExplainTest, SentenceNamesThingRemedyAndCode) {
  EXPECT_EQ("there is no share \"x\"; 'fileindexctl share list' shows the shares (error 800)",
            Explain(Error(Error::kNoSuchShare, "x")));
  EXPECT_EQ("the operation failed (error 1499)", Explain(Error(static_cast<Error::ErrorCode>(1499))));
  EXPECT_EQ("no; because (error 120)", Explain(Error(Error::kBadArgument, "no"), "because"));
  // What a failure is about decides, whatever its reason says.
  const auto about = [](Error::ErrorCode code, Subject::Kind kind) {
    return Explain(SubjectError(code, "r", {kind, "n"}));
  };
  EXPECT_EQ("the search engine: n (error 1400)", about(Error::kEngineBusy, Subject::kEngineRefusal));
  EXPECT_EQ("cannot write n; see that its folder can be written and has space (error 505)",
            about(Error::kSaveFailed, Subject::kFile));
  EXPECT_EQ("r; the index daemon does not answer; 'fileindexctl up' starts it (error 502)",
            about(Error::kInternal, Subject::kDaemonChannel));
  EXPECT_EQ("no queue can be had for the folder n; the system log says more (error 502)",
            about(Error::kInternal, Subject::kQueuePlace));
}

TEST(ProgressTest, TextGrowsWithWhatIsKnown) {
  Json::Value share;
  share["state"] = "waiting for space";
  share["detail"] = "less than 100 MiB";
  EXPECT_EQ("waiting for space: less than 100 MiB", Progress::Text(share, 4));
  share["state"] = "indexing";
  share["operations"] = 1200;
  share["operations_done"] = 7;
  EXPECT_EQ("7 of 1,200 changes", Progress::Text(share, 4));
  Json::Value& comparison = share["comparison"];
  comparison["running"] = true;
  comparison["examined"] = 1500;
  comparison["elapsed_ms"] = 1000;
  comparison["estimate"] = 2000;
  comparison["estimate_complete"] = false;
  EXPECT_EQ("1,500 files, 1,500 a second", Progress::Text(share, 4));
  comparison["estimate_complete"] = true;
  EXPECT_EQ("[### ] 75%  1,500 of 2,000 files, 1,500 a second, 0.3 s left", Progress::Text(share, 4));
}

TEST(FormatTest, FiguresForPeople) {
  EXPECT_EQ("0 999 1,000 1,234,567", Count(0) + " " + Count(999) + " " + Count(1000) + " " + Count(1234567));
  EXPECT_EQ("999 B 1.0 KB 12 KB 1.5 MB", Size(999) + " " + Size(1000) + " " + Size(12345) + " " + Size(1500000));
  EXPECT_EQ("0.5 s 59 s 1 min 0 s 2 h 5 min",
            Duration(0.5) + " " + Duration(59) + " " + Duration(59.7) + " " + Duration(7500));
}

}  // namespace
}  // namespace ferrox::cli
