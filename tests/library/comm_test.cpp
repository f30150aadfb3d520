// Catches replies of the engine that become another result or error, and a busy engine that is given up.
#include "fileindex/elastic/comm.h"

#include <cerrno>
#include <cstring>

#include "tests/support/library_test.h"

namespace ferrox::fileindex::elastic {

namespace {

using test::FakeConnection;
using test::Parse;

constexpr char kCompound[] = R"({"compound":[{"command":"a"},{"command":"b"}]})";

class CommTest : public test::LibraryTest {
 protected:
  // The scripted connections look no further than that it is there.
  void SetUp() override { test::WriteFile(socket_, ""); }
  void TearDown() override { (void)std::filesystem::remove(socket_); }

  /// "<code> <reason>" of what SendRequestImpl throws when the engine answers `reply`, else the reply as filled in.
  std::string Ask(const std::string& reply, const std::string& request = "{}",
                  FakeConnection::Fault fault = FakeConnection::kNone) {
    Json::Value res = "left from before";
    platform_.connections = {{reply, fault}};
    errno = 0;
    const std::string failure = test::FailureOf([&] { SendRequestImpl(res, Parse(request)); });
    return failure.empty() ? toString(res) : failure;
  }

  const std::string socket_ = InstancePath(kElasticdSocket);
};

}  // namespace

TEST_F(CommTest, RepliesAndWhatTheyBecome) {
  struct Row {
    const char *reply, *outcome;
  };
  for (const Row& row : {
           Row{R"({"success":true})", R"({"success":true})"},
           Row{R"({"has_fail":true,"success":true,"data":5})", R"({"data":5,"has_fail":true,"success":true})"},
           Row{"no json", "913 Recv failed, res=null"},
           Row{"[1]", "913 Recv failed, res=[1]"},
           Row{"{}", "913 Recv failed, res={}"},
           Row{R"({"success":"true"})", R"(913 Recv failed, res={"success":"true"})"},
           Row{R"({"success":false,"error":{"code":1404,"msg":"no such index"}})",
               "1404 Request failed, msg=no such index"},
           Row{R"({"success":false})", "120 Missing property: code, data=null\n"},
           Row{R"({"success":false,"error":7})", "120 Not an object, data=7\n"},
       }) {
    SCOPED_TRACE(row.reply);
    log_.Lines().clear();
    EXPECT_EQ(Ask(row.reply), row.outcome);
    const bool logged = row.outcome[0] != '{' && strncmp(row.outcome, "14", 2) != 0;
    EXPECT_EQ(log_.Lines().size(), logged ? 1U : 0U) << "the engine has logged its own failures";
  }
  EXPECT_EQ(platform_.connected_paths.front(), socket_);
}

TEST_F(CommTest, BrokenConnectionsAreUnreachable) {
  EXPECT_EQ(Ask("{}", "{}", FakeConnection::kConnect), "913 Connect failed");
  EXPECT_EQ(Ask("{}", "{}", FakeConnection::kSend), "913 Send failed");
  EXPECT_EQ(Ask("{}", "{}", FakeConnection::kRecv), "913 Recv failed, res=null");
  EXPECT_TRUE(
      log_.Contains("Failed [!conn.Recv(resp_raw) || !res.fromString(resp_raw) || "
                    "!res.isMember(\"success\") || !res[\"success\"].isBool()], reason: Recv failed"));
}

TEST_F(CommTest, WaitsFifteenSecondsForTheSocket) {
  (void)std::filesystem::remove(socket_);
  EXPECT_EQ(Ask("{}", "{}", FakeConnection::kConnect), "913 Connect failed");
  EXPECT_EQ(clock_.sleeps, std::vector<std::chrono::milliseconds>(15, std::chrono::seconds(1)));
  ASSERT_EQ(log_.Lines().size(), 16U);
  EXPECT_NE(log_.Lines()[14].find(" elastic socket is not ready, retry ... 15"), std::string::npos);
}

TEST_F(CommTest, PartsOfACompoundThatFailed) {
  const std::string head = R"({"success":true,"has_fail":true,"data":)";
  const std::string failed = R"({"success":false,"error":{"code":5,"msg":"five"}})";
  const std::string busy = R"({"success":false,"error":{"code":1401,"msg":"memory"}})";
  EXPECT_EQ(Ask(head + "[" + failed + "," + busy + "]}", kCompound), "1401 memory");
  EXPECT_TRUE(log_.Contains("(SendRequestImpl) Compound failed: {\"command\":\"a\"} (5) five"));
  // Not looked at: no has_fail, or no compound.
  EXPECT_EQ(Ask(R"({"success":true,"has_fail":false,"data":[)" + busy + "]}", kCompound)[0], '{');
  EXPECT_EQ(Ask(head + "[" + busy + "]}")[0], '{');
  // More results than parts, results without a reason, and none at all.
  for (const char* data : {"[{},{\"success\":true},null,{\"success\":false}]", "[]", "null"}) {
    EXPECT_EQ(Ask(head + data + "}", kCompound)[0], '{') << data;
  }
  for (const char* data : {"5", "{}", "[5]", "[[]]", "[{\"error\":[]}]"}) {
    EXPECT_EQ(Ask(head + data + "}", kCompound).rfind("913 Recv failed, res=", 0), 0U) << data;
  }
}

TEST_F(CommTest, ABusyEngineIsAskedAgainAndAgain) {
  size_t noticed_after = 0;
  platform_.engine = [&](const std::string&) {
    if (platform_.executed.empty()) ++noticed_after;
    return clock_.sleeps.size() == 13 ? R"({"success":true,"data":"done"})"
           : clock_.sleeps.size() % 2 ? R"({"success":false,"error":{"code":1400,"msg":"busy"}})"
                                      : R"({"success":true,"has_fail":true,"data":[{"success":false,)"
                                        R"("error":{"code":1401,"msg":"m"}}]})";
  };
  Json::Value res, request = Parse(kCompound);
  request["command"] = "commit";
  request["data"]["id"] = "fileindex_photo";
  SendRequest(res, request);
  EXPECT_EQ(res["data"], "done");
  ASSERT_EQ(clock_.sleeps.size(), 13U);
  for (const auto pause : clock_.sleeps) {
    EXPECT_TRUE(pause.count() >= 900000 && pause.count() <= 1140000 && pause.count() % 60000 == 0) << pause.count();
  }
  ASSERT_EQ(log_.Lines().size(), 13U);
  EXPECT_TRUE(log_.Contains(" Retry[12] since kovaelasticd is busy. Command: commit, db: fileindex_photo"));
  EXPECT_EQ(platform_.executed.size(), 1U) << "the administrators are told once";
  EXPECT_EQ(platform_.executed[0].arguments.back(), "error:lack_of_memory");
  EXPECT_EQ(noticed_after, 11U);
}

}  // namespace ferrox::fileindex::elastic
