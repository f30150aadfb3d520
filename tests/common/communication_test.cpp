// Catches requests to a daemon that are cut short, sent to nobody without a word, or never waited for.
#include "common/communication.h"

#include <sys/socket.h>
#include <unistd.h>

#include <memory>
#include <thread>

#include "base/unique_fd.h"
#include "tests/support/library_test.h"
#include "tests/support/unix_server.h"

namespace ferrox {

namespace {

using test::FailureOf;
using Sleeps = std::vector<std::chrono::milliseconds>;

std::string Frame(const std::string& body) {
  const auto size = static_cast<uint32_t>(body.size());
  return std::string(reinterpret_cast<const char*>(&size), sizeof(size)) + body;
}

/// Takes one request into `request`, then sends `reply` in pieces of `piece` bytes.
std::function<void(int)> Daemon(std::string& request, const std::string& reply, size_t piece) {
  return [&request, reply, piece](int fd) {
    uint32_t size = 0;
    BufferRead(fd, sizeof(size), reinterpret_cast<unsigned char*>(&size));
    request.resize(size);
    BufferRead(fd, size, reinterpret_cast<unsigned char*>(request.data()));
    for (size_t at = 0; at < reply.size(); at += piece) {
      const std::string next = reply.substr(at, piece);
      EXPECT_EQ(write(fd, next.data(), next.size()), static_cast<ssize_t>(next.size()));
    }
  };
}

using CommunicationTest = test::LibraryTest;

}  // namespace

TEST_F(CommunicationTest, RequestEndsInAZeroByteAndTheReplyIsDropped) {
  const std::string big(5000, 'r');
  for (const auto& [reply, piece] : {std::pair{Frame(""), 4U}, {Frame("ok"), 1U}, {Frame(big), 5000U}}) {
    std::string request;
    {
      const test::UnixServer daemon(InstancePath(kFileIndexdSocket), Daemon(request, reply, piece));
      SendCommandToDaemon("t", "d");
    }
    EXPECT_EQ(request, std::string(R"({"data":"d","type":"t"})") + '\0');
  }
}

TEST_F(CommunicationTest, WaitsForTheSocketToAppear) {
  static std::unique_ptr<test::UnixServer> daemon;
  static std::string request;
  static int sleeps;
  sleeps = 0;
  clock_.on_sleep = [] {
    if (++sleeps != 2) return;
    daemon = std::make_unique<test::UnixServer>(InstancePath(kFileIndexdSocket), Daemon(request, Frame("ok"), 6));
  };
  SendCommandToDaemon("late", Json::Value());
  daemon.reset();
  EXPECT_EQ(clock_.sleeps, Sleeps(2, std::chrono::seconds(1)));
  EXPECT_EQ(request, std::string("{\"data\":null,\"type\":\"late\"}") + '\0');
}

TEST_F(CommunicationTest, AMissingDaemonIsAWriteFailure) {
  const auto send = [] { SendCommandToDaemon("t", Json::Value()); };
  EXPECT_EQ(FailureOf(send).rfind("502 write failed, reason=", 0), 0U);
  EXPECT_EQ(clock_.sleeps, Sleeps(4, std::chrono::seconds(1)));
  test::WriteFile(InstancePath(kFileIndexdSocket), "no socket");
  EXPECT_EQ(FailureOf(send).rfind("502 write failed, reason=", 0), 0U);
  EXPECT_EQ(clock_.sleeps.size(), 4U) << "only a missing socket is worth waiting for";
  (void)unlink(InstancePath(kFileIndexdSocket).c_str());
}

TEST_F(CommunicationTest, MovesExactlySoManyBytes) {
  int pair[2];
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, pair), 0);
  const base::UniqueFd near(pair[0]), far(pair[1]);
  std::vector<unsigned char> sent(300001), got(sent.size());
  for (size_t i = 0; i < sent.size(); ++i) sent[i] = static_cast<unsigned char>(i * 7);
  std::thread writer([&] { BufferWrite(near.Get(), static_cast<unsigned>(sent.size()), sent.data()); });
  BufferRead(far.Get(), static_cast<unsigned>(got.size()), got.data());
  writer.join();
  EXPECT_EQ(got, sent);
  EXPECT_EQ(FailureOf([&] { BufferRead(-1, 0, got.data()), BufferWrite(-1, 0, got.data()); }), "");
  EXPECT_EQ(FailureOf([&] { BufferRead(-1, 1, got.data()); }), "502 read failed, reason=Bad file descriptor");
  EXPECT_EQ(FailureOf([&] { BufferWrite(-1, 1, got.data()); }), "502 write failed, reason=Bad file descriptor");
}

// A file at its end reads 0 bytes until somebody appends.
TEST_F(CommunicationTest, TheEndOfTheStreamIsAskedAgain) {
  static test::TempDir dir;
  test::WriteFile(dir / "f", "ab");
  FILE* file = fopen((dir / "f").c_str(), "r");
  static int sleeps;
  sleeps = 0;
  clock_.on_sleep = [] {
    if (++sleeps == 3) test::WriteFile(dir / "f", "abcd");
  };
  char bytes[5] = {};
  BufferRead(fileno(file), 4, reinterpret_cast<unsigned char*>(bytes));
  (void)fclose(file);
  EXPECT_STREQ(bytes, "abcd");
  EXPECT_EQ(clock_.sleeps, Sleeps(3, std::chrono::milliseconds(50)));
}

}  // namespace ferrox
