#include "common/communication.h"

#include <sys/socket.h>
#include <unistd.h>

#include <cstring>
#include <memory>
#include <thread>

#include <gtest/gtest.h>
#include <json/value.h>

#include "common/error.h"
#include "common/json_util.h"
#include "common/paths.h"
#include "common/unique_fd.h"
#include "tests/support/fake_clock.h"
#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"
#include "tests/support/unix_server.h"

namespace ferrox {

namespace {

std::string ReadAll(int fd, size_t size) {
  std::string bytes(size, '\0');
  for (size_t got = 0; got < size;) {
    const ssize_t piece = read(fd, bytes.data() + got, size - got);
    if (piece <= 0) return bytes.substr(0, got);
    got += static_cast<size_t>(piece);
  }
  return bytes;
}

std::string Frame(const std::string& body) {
  const auto size = static_cast<uint32_t>(body.size());
  return std::string(reinterpret_cast<const char*>(&size), sizeof(size)) + body;
}

/// Takes one request into `request`, then sends `reply` in pieces of `piece` bytes.
std::function<void(int)> Daemon(std::string& request, const std::string& reply, size_t piece) {
  return [&request, reply, piece](int fd) {
    uint32_t size = 0;
    const std::string head = ReadAll(fd, sizeof(size));
    memcpy(&size, head.data(), sizeof(size));
    request = ReadAll(fd, size);
    for (size_t at = 0; at < reply.size(); at += piece) {
      const std::string next = reply.substr(at, piece);
      EXPECT_EQ(write(fd, next.data(), next.size()), static_cast<ssize_t>(next.size()));
      if (piece < 10) (void)usleep(1000);
    }
  };
}

std::string FailureText(const std::function<void()>& call) {
  try {
    call();
    return {};
  } catch (const Error& error) {
    EXPECT_EQ(error.Code(), Error::kInternal);
    return error.what();
  }
}

}  // namespace

TEST(SendCommandTest, RequestEndsInAZeroByteAndTheReplyIsDropped) {
  // {"data":"...","type":"t"} of 100 bytes
  const Json::Value data = std::string(100 - strlen(R"({"data":"","type":"t"})"), 'd');
  for (const auto& [reply, piece] :
       {std::pair{Frame(""), 4U}, {Frame("ok"), 1U}, {Frame(std::string(5000, 'r')), 5000U}}) {
    std::string request;
    {
      const test::UnixServer daemon(InstancePath(kFileIndexdSocket), Daemon(request, reply, piece));
      SendCommandToDaemon("t", data);
    }
    ASSERT_EQ(request.size(), 101U);
    EXPECT_EQ(request.back(), '\0');
    Json::Value sent;
    ASSERT_TRUE(fromString(sent, request.substr(0, 100)));
    EXPECT_EQ(sent["type"], "t");
    EXPECT_EQ(sent["data"], data);
  }
}

TEST(SendCommandTest, WaitsForTheSocketToAppear) {
  static std::unique_ptr<test::UnixServer> daemon;
  static std::string request;
  static int sleeps;
  sleeps = 0;
  test::FakeClock clock;
  clock.on_sleep = [] {
    if (++sleeps != 2) return;
    daemon = std::make_unique<test::UnixServer>(InstancePath(kFileIndexdSocket), Daemon(request, Frame("ok"), 6));
  };
  SendCommandToDaemon("late", Json::Value());
  daemon.reset();
  EXPECT_EQ(clock.sleeps, std::vector<std::chrono::milliseconds>(2, std::chrono::seconds(1)));
  EXPECT_EQ(request, std::string("{\"data\":null,\"type\":\"late\"}") + '\0');
}

TEST(SendCommandTest, AMissingDaemonIsAWriteFailure) {
  test::FakeClock clock;
  const test::LogCapture log;
  const std::string text = FailureText([] { SendCommandToDaemon("t", Json::Value()); });
  EXPECT_EQ(text.rfind("write failed, reason=", 0), 0U) << text;
  EXPECT_EQ(clock.sleeps, std::vector<std::chrono::milliseconds>(4, std::chrono::seconds(1)));
  EXPECT_EQ(log.Lines()[0].rfind("communication:", 0), 0U);
  clock.sleeps.clear();
  test::WriteFile(InstancePath(kFileIndexdSocket), "no socket");
  EXPECT_EQ(FailureText([] { SendCommandToDaemon("t", Json::Value()); }).rfind("write failed, reason=", 0), 0U);
  EXPECT_TRUE(clock.sleeps.empty()) << "only a missing socket is worth waiting for";
  (void)unlink(InstancePath(kFileIndexdSocket).c_str());
}

TEST(BufferTest, MovesExactlySoManyBytes) {
  int pair[2];
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, pair), 0);
  const UniqueFd near(pair[0]), far(pair[1]);
  std::string sent(300001, '\0'), got(sent.size(), '\0');
  for (size_t i = 0; i < sent.size(); ++i) sent[i] = static_cast<char>(i * 7);
  std::thread writer([&] {
    BufferWrite(near.Get(), static_cast<unsigned>(sent.size()), reinterpret_cast<const unsigned char*>(sent.data()));
  });
  BufferRead(far.Get(), static_cast<unsigned>(got.size()), reinterpret_cast<unsigned char*>(got.data()));
  writer.join();
  EXPECT_EQ(got, sent);
  EXPECT_NO_THROW(BufferRead(-1, 0, nullptr));
  EXPECT_NO_THROW(BufferWrite(-1, 0, nullptr));
  unsigned char byte = 0;
  EXPECT_EQ(FailureText([&] { BufferRead(-1, 1, &byte); }), "read failed, reason=Bad file descriptor");
  EXPECT_EQ(FailureText([&] { BufferWrite(-1, 1, &byte); }), "write failed, reason=Bad file descriptor");
}

// A file at its end reads 0 bytes until somebody appends.
TEST(BufferTest, TheEndOfTheStreamIsAskedAgain) {
  static test::TempDir dir;
  test::WriteFile(dir / "f", "ab");
  FILE* file = fopen((dir / "f").c_str(), "r");
  static int sleeps;
  sleeps = 0;
  test::FakeClock clock;
  clock.on_sleep = [] {
    if (++sleeps == 3) test::WriteFile(dir / "f", "abcd");
  };
  char bytes[5] = {};
  BufferRead(fileno(file), 4, reinterpret_cast<unsigned char*>(bytes));
  (void)fclose(file);
  EXPECT_STREQ(bytes, "abcd");
  EXPECT_EQ(clock.sleeps, std::vector<std::chrono::milliseconds>(3, std::chrono::milliseconds(50)));
}

}  // namespace ferrox
