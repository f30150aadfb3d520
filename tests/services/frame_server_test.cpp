#include "services/support/frame_server.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <cstring>
#include <optional>
#include <thread>

#include <gtest/gtest.h>

#include "common/error.h"
#include "tests/support/temp_dir.h"

namespace ferrox::services {
namespace {

/// A client that says exactly the bytes it is told to.
class Client {
 public:
  explicit Client(const std::string& path) : fd_(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    memcpy(address.sun_path, path.c_str(), path.size() + 1);
    EXPECT_EQ(connect(fd_.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)), 0);
  }

  void SendRaw(const std::string& bytes) {
    EXPECT_EQ(send(fd_.Get(), bytes.data(), bytes.size(), MSG_NOSIGNAL), static_cast<ssize_t>(bytes.size()));
  }
  void SendLength(uint32_t length) { SendRaw({reinterpret_cast<const char*>(&length), sizeof(length)}); }
  void SendFrame(const std::string& body) {
    SendLength(static_cast<uint32_t>(body.size()));
    SendRaw(body);
  }

  /// The next reply's body; none when the server has ended the connection.
  std::optional<std::string> ReceiveFrame() {
    uint32_t length = 0;
    if (recv(fd_.Get(), &length, sizeof(length), MSG_WAITALL) != sizeof(length)) return std::nullopt;
    std::string body(length, '\0');
    if (length > 0 && recv(fd_.Get(), body.data(), length, MSG_WAITALL) != static_cast<ssize_t>(length))
      return std::nullopt;
    return body;
  }

 private:
  UniqueFd fd_;
};

/// A server that answers with the request reversed, fails on "fail", and runs while the fixture lives.
class FrameServerTest : public testing::Test {
 protected:
  void Start(FrameServerOptions options) {
    options.socket_path = path_;
    server_ = std::make_unique<FrameServer>(options, [](const std::string& request, const Peer& peer) {
      EXPECT_EQ(peer.uid, geteuid());
      if (request == "fail") throw std::runtime_error("asked to");
      return std::string(request.rbegin(), request.rend());
    });
    thread_ = std::thread([this] { server_->Run(-1); });
  }
  void TearDown() override {
    if (!server_) return;
    server_->Stop();
    thread_.join();
  }

  test::TempDir folder_;
  const std::string path_ = folder_ / "socket";
  std::unique_ptr<FrameServer> server_;
  std::thread thread_;
};

TEST_F(FrameServerTest, AnswersSeveralRequestsOfOneConnectionSentInPieces) {
  Start({});
  Client client(path_);
  const std::string big(300000, 'x');
  for (const std::string& body : {std::string("abc"), std::string(), big}) {
    const auto length = static_cast<uint32_t>(body.size());
    const std::string frame = std::string(reinterpret_cast<const char*>(&length), 4) + body;
    for (size_t at = 0; at < frame.size();) {
      const size_t piece = at < 6 ? 1 : frame.size() - at;
      client.SendRaw(frame.substr(at, piece));
      at += piece;
    }
    EXPECT_EQ(client.ReceiveFrame(), std::string(body.rbegin(), body.rend()));
  }
}

TEST_F(FrameServerTest, HostileClientsCostOnlyTheirOwnConnection) {
  FrameServerOptions options;
  options.request_limit_bytes = 1000;
  options.requests_limit_bytes = 1500;
  Start(options);
  Client silent(path_);
  Client huge(path_);
  huge.SendLength(0xFFFFFFFF);
  EXPECT_EQ(huge.ReceiveFrame(), std::nullopt);
  { Client early(path_); }
  {
    Client half(path_);
    half.SendLength(500);
    half.SendRaw("only this");
  }
  Client failing(path_);
  failing.SendFrame("fail");
  EXPECT_EQ(failing.ReceiveFrame(), std::nullopt);
  Client good(path_);
  good.SendFrame("abc");
  EXPECT_EQ(good.ReceiveFrame(), "cba");
}

TEST_F(FrameServerTest, UnansweredBytesAreBoundedAndGivenBack) {
  FrameServerOptions options;
  options.request_limit_bytes = 1000;
  options.requests_limit_bytes = 1500;
  Start(options);
  for (int round = 0; round < 5; ++round) {
    Client first(path_);
    first.SendLength(1000);
    first.SendRaw(std::string(900, 'a'));
    Client probe(path_);  // once it is answered, what was sent before has been received
    probe.SendFrame("x");
    EXPECT_EQ(probe.ReceiveFrame(), "x");
    Client second(path_);
    second.SendLength(1000);
    second.SendRaw(std::string(900, 'b'));
    EXPECT_EQ(second.ReceiveFrame(), std::nullopt);
    first.SendRaw(std::string(100, 'a'));
    EXPECT_EQ(first.ReceiveFrame(), std::string(1000, 'a'));
  }
}

TEST_F(FrameServerTest, NewcomerTakesThePlaceOfTheLongestSilent) {
  FrameServerOptions options;
  options.connections_max = 2;
  Start(options);
  Client oldest(path_);
  oldest.SendFrame("1");
  EXPECT_EQ(oldest.ReceiveFrame(), "1");
  Client second(path_);
  second.SendFrame("2");
  EXPECT_EQ(second.ReceiveFrame(), "2");
  Client third(path_);
  third.SendFrame("3");
  EXPECT_EQ(third.ReceiveFrame(), "3");
  EXPECT_EQ(oldest.ReceiveFrame(), std::nullopt);
  second.SendFrame("4");
  EXPECT_EQ(second.ReceiveFrame(), "4");
}

TEST_F(FrameServerTest, ReplacesADeadProcessesSocketButNotALiveOnes) {
  {
    const UniqueFd dead(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    memcpy(address.sun_path, path_.c_str(), path_.size() + 1);
    ASSERT_EQ(bind(dead.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)), 0);
  }
  Start({});
  FrameServerOptions options;
  options.socket_path = path_;
  EXPECT_THROW(FrameServer(options, [](const std::string& body, const Peer&) { return body; }), Error);
}

}  // namespace
}  // namespace ferrox::services
