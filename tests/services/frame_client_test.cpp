// Catches failures of a request that look like another, and waits that outlast their time or a cancellation.
#include "wire/frame_client.h"

#include <sys/socket.h>
#include <unistd.h>

#include <filesystem>

#include <gtest/gtest.h>

#include "common/paths.h"
#include "tests/support/unix_server.h"
#include "wire/cancellation.h"

namespace ferrox::wire {
namespace {

using std::chrono::milliseconds;
constexpr std::chrono::minutes kLong(5);

std::string Frame(const std::string& body) {
  const auto size = static_cast<uint32_t>(body.size());
  return std::string(reinterpret_cast<const char*>(&size), sizeof(size)) + body;
}

class FrameClientTest : public testing::Test {
 protected:
  FrameClientTest() { std::filesystem::create_directories(std::filesystem::path(socket_).parent_path()); }

  /// What comes of a request to a daemon that reads it, sends `bytes` and closes.
  Reply ReplyTo(const std::string& bytes) {
    const test::UnixServer daemon(socket_, [&](int fd) {
      char request[1000];
      const ssize_t size = recv(fd, request, sizeof(request), 0);
      request_.assign(request, size > 0 ? static_cast<size_t>(size) : 0);
      (void)send(fd, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    });
    return AskDaemon(kNotifydSocket, "status", Json::Value(), kLong);
  }

  std::string socket_ = InstancePath(kNotifydSocket);
  std::string request_;
};

TEST_F(FrameClientTest, EachWayToFailHasItsOutcome) {
  EXPECT_EQ(Outcome::kNotRunning, AskDaemon(kNotifydSocket, "status", Json::Value(), kLong).outcome);
  EXPECT_FALSE(IsServed(socket_));
  struct Row {
    Outcome outcome;
    std::string bytes, text;
  };
  for (const Row& row : {
           Row{Outcome::kAnswered, Frame(R"({"success":true,"data":"fine"})"), "fine"},
           Row{Outcome::kRefused, Frame(R"({"success":false,"error":{"code":401,"msg":"no"}})"), "no"},
           Row{Outcome::kRefused, Frame(R"({"data":"fine","error":"no"})"), ""},
           Row{Outcome::kUnreadable, Frame("[]"), ""},
           Row{Outcome::kUnreadable, "\xff\xff\xff\xff", ""},
           Row{Outcome::kPeerClosed, Frame("{}").substr(0, 5), ""},
           Row{Outcome::kPeerClosed, "", ""},
       }) {
    const Reply reply = ReplyTo(row.bytes);
    EXPECT_EQ(row.outcome, reply.outcome) << row.bytes;
    EXPECT_EQ(row.text, reply.outcome == Outcome::kAnswered ? reply.data.asString() : reply.message) << row.bytes;
    EXPECT_EQ(row.text == "no" ? 401 : 0, reply.code);
  }
  EXPECT_EQ(request_, Frame(std::string(R"({"data":null,"type":"status"})") + '\0'));
}

TEST_F(FrameClientTest, AWaitEndsInTimeOrWhenItIsCancelled) {
  Cancellation cancellation;
  const auto silent = [&](int fd) {
    char request[1000];
    (void)recv(fd, request, sizeof(request), 0);
    cancellation.Cancel();
    (void)recv(fd, request, sizeof(request), 0);
  };
  const test::UnixServer daemon(socket_, silent, 3);
  const auto ask = [](milliseconds longest) { return AskDaemon(kNotifydSocket, "x", Json::Value(), longest).outcome; };
  {
    const CancellationScope scope(cancellation);
    EXPECT_EQ(Outcome::kPeerClosed, ask(kLong));
    EXPECT_EQ(Outcome::kPeerClosed, ask(kLong)) << "one that begins later";
  }
  EXPECT_EQ(Outcome::kNoAnswer, ask(milliseconds(1)));
}

}  // namespace
}  // namespace ferrox::wire
