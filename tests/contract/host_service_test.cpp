// Services of an instance as child processes, with a stand-in for the daemons.

#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include <kova/error.h>
#include <kova/service.h>

#include "platform/host/child_service.h"
#include "platform/host/service_log.h"
#include "platform/shared/frames.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

using std::string;

constexpr char kEngine[] = "kovaelasticd";
constexpr char kIndexDaemon[] = "pkg-Ferrox-fileindexd";

class HostServiceTest : public testing::Test {
 protected:
  void SetUp() override {
    for (const char* name : {"kovaelasticd", "fileindexd"}) {
      std::filesystem::copy_file(FERROX_SERVICE_HELPER, programs_ / name);
    }
    (void)setenv("FERROX_LIBEXEC", programs_.Path().c_str(), 1);
    std::filesystem::remove_all(TestRoot() + "/var/log");
  }
  void TearDown() override {
    std::filesystem::remove(TestRoot() + "/helper_mode");
    for (const char* name : {kEngine, kIndexDaemon}) EXPECT_EQ(0, KLIBServiceStop(name, 1));
  }

  static string Log(const char* program) { return ReadFile(kova::host::ServiceLogPath(program)); }
  static pid_t Pid(const char* program) { return std::stoi(ReadFile(TestRoot() + "/var/run/" + program + ".pid")); }

  TempDir programs_;
};

TEST_F(HostServiceTest, ALogThatIsWrittenToStaysBounded) {
  const string path = programs_ / "daemon.log";
  std::ofstream log(path, std::ios::app);
  log << string((16 << 20) + 1, 'x') << std::flush;
  kova::host::BoundLog(path);
  log << "next\n" << std::flush;
  kova::host::BoundLog(path);
  EXPECT_EQ("next\n", ReadFile(path));
  EXPECT_EQ((16U << 20) + 1, std::filesystem::file_size(path + ".1"));
}

TEST_F(HostServiceTest, StartedMeansThatItAnswers) {
  EXPECT_EQ(0, KLIBServiceIsRunning(kEngine));
  ASSERT_EQ(0, KLIBServiceStart(kEngine, 1)) << kova::host::LastServiceProblem();
  EXPECT_EQ(1, KLIBServiceIsRunning(kEngine));
  const int connection = kova::ConnectUnixSocket(TestRoot() + "/var/run/kovaelasticd.sock");
  EXPECT_GE(connection, 0);
  (void)close(connection);
  const pid_t pid = Pid(kEngine);
  EXPECT_EQ(0, KLIBServicectlStart(kEngine, KLIB_SERVICECTL_UPSTART)) << "it runs already";
  EXPECT_EQ(pid, Pid(kEngine));
  EXPECT_EQ(0, KLIBServiceRestart(kEngine));
  EXPECT_NE(pid, Pid(kEngine));
  EXPECT_EQ(0, KLIBServiceStop(kEngine, 1));
  EXPECT_EQ(0, KLIBServiceIsRunning(kEngine));
  EXPECT_EQ(0, KLIBServiceStop(kEngine, 1)) << "it is stopped already";
}

TEST_F(HostServiceTest, AServiceInheritsNothing) {
  const int inheritable = open("/dev/null", O_RDONLY);
  (void)signal(SIGPIPE, SIG_IGN);
  ASSERT_EQ(0, KLIBServiceStart(kEngine, 1)) << kova::host::LastServiceProblem();
  (void)signal(SIGPIPE, SIG_DFL);
  (void)close(inheritable);
  EXPECT_EQ("started sid=1 descriptors=3 sigpipe=default\n", Log(kEngine));
}

TEST_F(HostServiceTest, AServiceThatDiesEarlyIsAFailureWithItsLastWords) {
  WriteFile(TestRoot() + "/helper_mode", "die");
  EXPECT_LT(KLIBServiceStart(kEngine, 1), 0);
  const string problem = kova::host::LastServiceProblem();
  EXPECT_NE(string::npos, problem.find("ended at once: the index is on fire")) << problem;
  EXPECT_NE(string::npos, problem.find(kova::host::ServiceLogPath(kEngine))) << problem;
}

TEST_F(HostServiceTest, AKilledServiceIsNotRunningAndStartsAgain) {
  ASSERT_EQ(0, KLIBServiceStart(kEngine, 1)) << kova::host::LastServiceProblem();
  ASSERT_EQ(0, kill(Pid(kEngine), SIGKILL));
  for (int i = 0; i < 60000 && KLIBServiceIsRunning(kEngine) == 1; ++i) (void)usleep(1000);
  EXPECT_EQ(0, KLIBServiceIsRunning(kEngine));
  EXPECT_EQ(0, KLIBServiceStart(kEngine, 1)) << "its socket and pid file were left behind";
  EXPECT_EQ(1, KLIBServiceIsRunning(kEngine));
}

TEST_F(HostServiceTest, SeveralStartersStartOne) {
  std::vector<std::thread> starters;
  std::vector<int> results(8, -1);
  for (int& result : results) starters.emplace_back([&result] { result = KLIBServiceStart(kEngine, 1); });
  for (std::thread& starter : starters) starter.join();
  EXPECT_EQ(8, std::count(results.begin(), results.end(), 0));
  const string log = Log(kEngine);
  EXPECT_EQ(1, std::count(log.begin(), log.end(), '\n')) << log;
}

TEST_F(HostServiceTest, WhatCannotBeStartedSaysSo) {
  EXPECT_LT(KLIBServiceStart("no-such-service", 1), 0);
  EXPECT_EQ(KOVA_ERR_NOT_SUPPORTED, KLIBCErrGet());
  EXPECT_NE(string::npos, kova::host::LastServiceProblem().find("no-such-service"));
  EXPECT_LT(KLIBServiceIsRunning("no-such-service"), 0);
  EXPECT_LT(KLIBServiceRestart("samba"), 0) << "an instance does not switch the host's own";
  EXPECT_EQ(KOVA_ERR_NOT_SUPPORTED, KLIBCErrGet());
}

TEST_F(HostServiceTest, ProgramsRunWithoutAShell) {
  const string made = programs_ / "a b; $(exit 9)";
  EXPECT_EQ(0, KLIBCExec("/bin/mkdir", made.c_str(), static_cast<char*>(nullptr)));
  EXPECT_TRUE(std::filesystem::is_directory(made));
  EXPECT_EQ(7, KLIBCExecl("/bin/sh", 0xBB, "-c", "exit 7", static_cast<char*>(nullptr)));
  EXPECT_LT(KLIBCExec("/bin/sh", "-c", "kill -9 $$", static_cast<char*>(nullptr)), 0);
  EXPECT_LT(KLIBCExec("/no/such/program", "x", static_cast<char*>(nullptr)), 0);
}

}  // namespace
}  // namespace ferrox::test
