// Catches clients that cost the server more than their own connection.
#include "services/support/frame_server.h"

#include <poll.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <algorithm>
#include <atomic>
#include <future>
#include <list>
#include <optional>
#include <thread>

#include <gtest/gtest.h>

#include "common/error.h"
#include "services/support/json_command.h"
#include "services/support/request_gate.h"
#include "tests/support/temp_dir.h"

namespace ferrox::services {
namespace {

/// A new socket on which `use`, bind or connect, was called with the path.
template <typename Use>
base::UniqueFd Socket(const std::string& path, const Use& use) {
  base::UniqueFd fd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  (void)path.copy(address.sun_path, sizeof(address.sun_path) - 1);
  EXPECT_EQ(use(fd.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)), 0);
  return fd;
}

/// A client that says exactly the bytes it is told to.
class Client {
 public:
  explicit Client(const std::string& path) : fd_(Socket(path, connect)) {}

  void SendRaw(const std::string& bytes) {
    EXPECT_EQ(send(fd_.Get(), bytes.data(), bytes.size(), MSG_NOSIGNAL), static_cast<ssize_t>(bytes.size()));
  }
  void SendLength(uint32_t length) { SendRaw({reinterpret_cast<const char*>(&length), sizeof(length)}); }
  std::optional<std::string> Ask(const std::string& body) {
    SendLength(static_cast<uint32_t>(body.size()));
    SendRaw(body);
    return ReceiveFrame();
  }

  bool HasReply() {
    pollfd state = {fd_.Get(), POLLIN, 0};
    return poll(&state, 1, 1) == 1;
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
  base::UniqueFd fd_;
};

/// A server that answers with the request reversed, fails on "fail", and runs while the fixture lives.
class FrameServerTest : public testing::Test {
 protected:
  void Start() {
    server_ = std::make_unique<FrameServer>(options_, [](const std::string& request, const Peer& peer) {
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
  FrameServerOptions options_ = {path_};
  std::unique_ptr<FrameServer> server_;
  std::thread thread_;
};

TEST_F(FrameServerTest, AnswersSeveralRequestsOfOneConnectionSentInPieces) {
  Start();
  Client client(path_);
  const std::string big(300000, 'x');
  for (const std::string& body : {std::string("abc"), std::string(), big}) {
    const auto length = static_cast<uint32_t>(body.size());
    const std::string frame = std::string(reinterpret_cast<const char*>(&length), 4) + body;
    for (const char byte : frame.substr(0, 6)) client.SendRaw({byte});
    if (frame.size() > 6) client.SendRaw(frame.substr(6));
    EXPECT_EQ(client.ReceiveFrame(), std::string(body.rbegin(), body.rend()));
  }
}

TEST_F(FrameServerTest, HostileClientsCostOnlyTheirOwnConnection) {
  options_.request_limit_bytes = 1000;
  options_.requests_limit_bytes = 1500;
  Start();
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
  EXPECT_EQ(failing.Ask("fail"), std::nullopt);
  Client good(path_);
  EXPECT_EQ(good.Ask("abc"), "cba");
}

TEST_F(FrameServerTest, UnansweredBytesAreBoundedAndGivenBack) {
  options_.workers = 1;  // so that connections are looked at in their order
  options_.request_limit_bytes = 1000;
  options_.requests_limit_bytes = 1500;
  Start();
  for (int round = 0; round < 5; ++round) {
    Client first(path_);
    first.SendLength(1000);
    first.SendRaw(std::string(900, 'a'));
    Client probe(path_);  // once it is answered, what was sent before has been received
    EXPECT_EQ(probe.Ask("x"), "x");
    Client second(path_);
    second.SendLength(1000);
    second.SendRaw(std::string(900, 'b'));
    EXPECT_EQ(second.ReceiveFrame(), std::nullopt);
    first.SendRaw(std::string(100, 'a'));
    EXPECT_EQ(first.ReceiveFrame(), std::string(1000, 'a'));
  }
}

TEST_F(FrameServerTest, NewcomerTakesThePlaceOfTheLongestSilent) {
  options_.connections_max = 2;
  options_.workers = 1;  // so that the first is idle again when the second is answered
  Start();
  Client oldest(path_);
  EXPECT_EQ(oldest.Ask("1"), "1");
  Client second(path_);
  EXPECT_EQ(second.Ask("2"), "2");
  Client third(path_);
  EXPECT_EQ(third.Ask("3"), "3");
  EXPECT_EQ(oldest.ReceiveFrame(), std::nullopt);
  EXPECT_EQ(second.Ask("4"), "4");
}

TEST_F(FrameServerTest, ABoundUserHasFewRequestsAndConnections) {
  options_.users.is_bound = [](const Peer&) { return true; };
  options_.users.refusal = "refused";
  options_.users.request_limit_bytes = 100;
  options_.workers = 16;
  std::atomic<int> at_work{0};
  std::atomic<int> niceness{0};
  std::promise<void> go_on;
  const std::shared_future<void> until = go_on.get_future().share();
  server_ = std::make_unique<FrameServer>(options_, [&](const std::string& request, const Peer&) {
    if (request != "long") return request;
    niceness = getpriority(PRIO_PROCESS, 0);  // of the calling thread
    ++at_work;
    until.wait();
    return request;
  });
  thread_ = std::thread([this] { server_->Run(-1); });
  std::list<Client> clients;
  for (int i = 0; i < 16; ++i) {
    clients.emplace_back(path_);
    clients.back().SendLength(4);
    clients.back().SendRaw("long");
  }
  std::list<Client> refused;  // 2 are at work, 8 wait
  for (auto it = clients.begin(); refused.size() < 6; it = clients.begin()) {
    while (it != clients.end() && !it->HasReply()) ++it;
    if (it != clients.end()) refused.splice(refused.end(), clients, it);
  }
  for (Client& client : refused) EXPECT_EQ(client.ReceiveFrame(), "refused");
  EXPECT_EQ(Client(path_).Ask("short"), "refused");
  const auto ended = std::find_if(refused.begin(), refused.end(), [](Client& client) { return client.HasReply(); });
  ASSERT_NE(ended, refused.end()) << "the newcomer takes the place of an idle one";
  EXPECT_EQ(ended->ReceiveFrame(), std::nullopt);
  refused.erase(ended);
  while (at_work < 2) std::this_thread::yield();
  EXPECT_EQ(at_work, 2);
  EXPECT_GE(niceness, 10) << "others go first";
  go_on.set_value();
  for (Client& client : clients) EXPECT_EQ(client.ReceiveFrame(), "long");
  EXPECT_EQ(refused.back().Ask("short"), "short");
  refused.back().SendLength(101);
  EXPECT_EQ(refused.back().ReceiveFrame(), std::nullopt);
}

TEST(RequestGateTest, AmongUsersTheOneWithTheFewestAtWorkComesNext) {
  using Admission = RequestGate::Admission;
  RequestGate gate({3, 2, 2});
  for (const uint64_t id : {10, 11}) EXPECT_EQ(Admission::kRun, gate.Enter(1, id));
  for (const uint64_t id : {12, 13}) EXPECT_EQ(Admission::kWait, gate.Enter(1, id));
  EXPECT_EQ(Admission::kRefused, gate.Enter(1, 14));
  EXPECT_EQ(Admission::kRun, gate.Enter(2, 20));
  EXPECT_EQ(Admission::kWait, gate.Enter(3, 30)) << "all together have no more";
  EXPECT_EQ(std::nullopt, gate.Next());
  gate.Leave(1);
  EXPECT_EQ(std::optional<uint64_t>(30), gate.Next()) << "though it came last";
  gate.Leave(2);
  gate.Forget(1, 12);
  EXPECT_EQ(std::optional<uint64_t>(13), gate.Next());
  EXPECT_EQ(std::nullopt, gate.Next());
  RequestGate many({2, 1, 1});
  for (const uint64_t id : {40, 41}) EXPECT_EQ(Admission::kRun, many.Enter(4, id, true));
  for (const uint64_t id : {42, 43}) EXPECT_EQ(Admission::kWait, many.Enter(4, id, true));
}

TEST_F(FrameServerTest, ReplacesADeadProcessesSocketButNotALiveOnes) {
  (void)Socket(path_, bind);
  Start();
  EXPECT_THROW(FrameServer(options_, [](const std::string& body, const Peer&) { return body; }), Error);
}

TEST(JsonCommandTest, TooManyValuesAreRefusedBeforeTheyAreRead) {
  std::string values = "0";
  for (int i = 0; i < 60000; ++i) values += ",0";
  const auto command = [](const std::string&, const Json::Value& data) { return Json::Value(data.size()); };
  const auto answer = [&command](const std::string& data) {
    return AnswerJsonCommand("{\"type\":\"x\",\"data\":[" + data + "]}", Peer{geteuid()}, command);
  };
  EXPECT_EQ(answer("\"" + values + "\""), R"({"data":1,"success":true})") << "a long text is none";
  EXPECT_NE(answer(values).find("too many values"), std::string::npos);
}

}  // namespace
}  // namespace ferrox::services
