// The daemon itself, in an instance of its own, killed and started again.
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <random>
#include <string>
#include <thread>
#include <utility>

#include <gtest/gtest.h>

#include <kova/sock_connection.h>

#include "common/json_util.h"
#include "common/paths.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

class ElasticdTest : public testing::Test {
 protected:
  ~ElasticdTest() override { Stop(SIGKILL); }

  void Start() {
    char program[] = KOVAELASTICD;
    char* arguments[] = {program, nullptr};
    ASSERT_EQ(posix_spawn(&pid_, program, nullptr, nullptr, arguments, environ), 0);
    for (int i = 0; i < 6000; ++i) {
      if (!Send(R"({"command":"ping"})").isNull()) return;
      std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    FAIL() << "the daemon does not answer";
  }
  int Stop(int signal) {
    if (pid_ <= 0) return -1;
    (void)kill(pid_, signal);
    int status = 0;
    (void)waitpid(pid_, &status, 0);
    pid_ = -1;
    return status;
  }
  /// The reply; null when there is none.
  static Json::Value Send(const std::string& request) {
    kovadaemon::DomainSockConnection connection(InstancePath(kElasticdSocket));
    std::string text;
    Json::Value reply;
    if (connection.Connect() && connection.Send(request) && connection.Recv(text)) (void)fromString(reply, text);
    return reply;
  }
  int64_t MemoryKiB(const std::string& which) const {
    std::ifstream status("/proc/" + std::to_string(pid_) + "/status");
    int64_t kib = -1;
    for (std::string word; kib < 0 && status >> word;) {
      if (word == which) (void)(status >> kib);
    }
    return kib;
  }
  static bool Succeeds(const std::string& request) { return Send(request)["success"].asBool(); }
  static std::string Upsert(int number) {
    const std::string name = std::to_string(number);
    return R"({"command":"document_upsert_by_id","data":{"id":"k","doc_id":"/v/)" + name +
           R"(","data":{"KOVAMDTextContent":"steady unique)" + name + R"( words)" + std::string(500, ' ') + "\"}}}";
  }
  static int64_t Total(const std::string& query) {
    return Send(R"({"command":"search","data":{"query":")" + query + "\"}}")["data"]["total"].asInt64();
  }
  void CreateIndex() {
    const std::string path = test::TestRoot() + "/volume/db";
    ASSERT_TRUE(Succeeds(R"({"command":"index_create","data":{"id":"k","path":")" + path + "\"}}"));
  }

  pid_t pid_ = -1;
};

constexpr char kCommit[] = R"({"command":"commit","data":{"id":"k"}})";

TEST_F(ElasticdTest, KilledAtAnyMomentItFindsEveryCommittedDocument) {
  std::mt19937 random(4711);
  int answered = 0;
  int committed = 0;
  for (int round = 0; round < 20; ++round) {
    SCOPED_TRACE("round " + std::to_string(round) + ", " + std::to_string(committed) + " committed");
    Start();
    CreateIndex();
    ASSERT_GE(Total("steady"), committed);
    for (int probe = 0; probe < 5 && committed > 0; ++probe) {
      ASSERT_EQ(Total("unique" + std::to_string(random() % static_cast<unsigned>(committed))), 1);
    }
    // Changes that were answered and lost are owned up to, once.
    if (Succeeds(kCommit) && answered > 0) {
      // Documents of an earlier round may have outlived their kill, too: there may be more than this round's.
      ASSERT_GE(Total("steady"), answered);
      ASSERT_EQ(Total("unique" + std::to_string(answered - 1)), 1);
    }
    answered = committed;

    const pid_t victim = pid_;
    const auto delay = std::chrono::microseconds(random() % 20000);
    unsigned commits_left = 1 + random() % 8;  // so many come first, however slow the machine is
    std::thread killer;
    while (Succeeds(Upsert(answered))) {
      ++answered;
      if (random() % 8 != 0 || !Succeeds(kCommit)) continue;
      committed = answered;
      if (--commits_left != 0) continue;
      killer = std::thread([victim, delay] {
        std::this_thread::sleep_for(delay);
        (void)kill(victim, SIGKILL);
      });
    }
    ASSERT_TRUE(killer.joinable()) << "it ended before it was killed";
    killer.join();
    Stop(SIGKILL);
  }
  EXPECT_GT(committed, 100);
}

TEST_F(ElasticdTest, AskedToStopItCommitsAndLeavesNothingBehind) {
  Start();
  CreateIndex();
  (void)Send(kCommit);  // may still have to tell what another test has killed
  ASSERT_TRUE(Succeeds(Upsert(1000001)));
  EXPECT_EQ(Stop(SIGTERM), 0);
  EXPECT_FALSE(std::filesystem::exists(InstancePath(kElasticdSocket)));
  EXPECT_FALSE(std::filesystem::exists(test::TestRoot() + "/volume/db/uncommitted"));
  Start();
  EXPECT_EQ(Total("unique1000001"), 1);
  EXPECT_TRUE(Succeeds(kCommit));
}

#if !defined(FERROX_SANITIZED)
TEST_F(ElasticdTest, LargeRequestsNeitherTakeNorKeepManyTimesTheirSize) {
  Start();
  CreateIndex();
  std::string many = "[0,";
  while (many.size() < 50'000'000) many += "0,0,0,0,";
  for (const auto& [before, behind] : {std::pair{"", ""},
                                       {R"({"command":"search","data":{"x":)", "0]}}"},
                                       {R"({"compound":)", "0]}"},
                                       {R"({"compound":[{"command":"ping","data":{"x":)", "0]}}]}"}}) {
    const Json::Value reply = Send(before + many + behind);
    EXPECT_EQ(reply["error"]["code"], 1403) << before << toString(reply).substr(0, 200);
  }
  std::string compound = R"({"compound":[)" + Upsert(0);
  while (compound.size() < 16'000'000)
    compound += R"(,{"command":"document_del_by_id","data":{"id":"k","doc_id":"/no"}})";
  const Json::Value reply = Send(compound + "," + Upsert(1) + "]}");
  EXPECT_TRUE(reply["success"].asBool() && !reply["has_fail"].asBool());
  EXPECT_GT(reply["data"].size(), 200'000U);
  EXPECT_TRUE(Succeeds(kCommit));
  EXPECT_EQ(Total("unique0"), 1);
  EXPECT_EQ(Total("unique1"), 1) << "the last part, too";
  EXPECT_LT(MemoryKiB("VmHWM:"), 250'000);
  EXPECT_LT(MemoryKiB("VmRSS:"), 60'000);
}
#endif

}  // namespace
}  // namespace ferrox::engine
