// What every implementation of the platform promises. Built once for the fake and once for the Linux host.

#include <sys/socket.h>

#include <filesystem>
#include <functional>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include <kova/error.h>
#include <kova/file_index.h>
#include <kova/fs.h>
#include <kova/recycle.h>
#include <kova/share.h>
#include <kova/sock_connection.h>
#include <kova/user.h>

#include "platform/base/index_paths.h"
#include "platform/base/records.h"
#include "tests/contract/platform_setup.h"
#include "tests/support/temp_dir.h"
#include "tests/support/unix_server.h"

namespace ferrox::test {
namespace {

using std::string;

class PlatformContractTest : public testing::Test {
 protected:
  void SetUp() override { SetShares({}); }
  void TearDown() override { EXPECT_EQ(0, kova::LiveRecords()) << "records were not freed"; }

  /// An empty folder of that path below the test's own.
  string Folder(const string& path) {
    std::filesystem::create_directories(dir_ / path);
    return dir_ / path;
  }

  TempDir dir_;
};

/// "name share_path", or "-" when no share holds the path.
string Locate(const string& full_path) {
  char name[492] = {}, share_path[4096] = {};
  if (KOVAShareNamePathGet(full_path.c_str(), name, sizeof(name), share_path, sizeof(share_path)) < 0) return "-";
  return string(name) + " " + share_path;
}

TEST_F(PlatformContractTest, APathBelongsToTheDeepestShareOnWholeComponents) {
  const string photo = Folder("photo");
  SetShares({{"photo", photo}, {"deep", Folder("photo/a/deep")}, {"photos", Folder("photos")}});
  const struct {
    string path, located;
  } rows[] = {
      {photo, "photo /photo"},
      {photo + "/a.jpg", "photo /photo/a.jpg"},
      {photo + "/", "photo /photo/"},
      {photo + "/a", "photo /photo/a"},
      {photo + "/a/deep/x/y", "deep /deep/x/y"},
      {photo + "/a/deeper", "photo /photo/a/deeper"},
      {photo + "s/b", "photos /photos/b"},
      {photo + "graph", "-"},
      {dir_.Path(), "-"},
      {"photo/a", "-"},
      {"", "-"},
  };
  for (const auto& row : rows) EXPECT_EQ(row.located, Locate(row.path)) << row.path;
}

TEST_F(PlatformContractTest, AShareIsFoundByItsExactNameOnly) {
  const string photo = Folder("photo");
  SetShares({{"photo", photo}});
  KOVAShare* share = nullptr;
  ASSERT_GE(KOVAShareGet("photo", &share), 0);
  EXPECT_EQ("photo", string(share->name));
  EXPECT_EQ(photo, share->path);
  KOVAShareFree(share);
  for (const char* name : {"Photo", "phot", "photo ", ""}) {
    share = nullptr;
    EXPECT_LT(KOVAShareGet(name, &share), 0) << name;
    EXPECT_EQ(nullptr, share);
    EXPECT_EQ(KOVA_ERR_NO_SUCH_SHARE, KLIBCErrGet());
    EXPECT_GT(KLIBCErrorGetLine(), 0);
    EXPECT_NE("", string(KLIBCErrorGetFile()));
  }
  char small[4], path[4096];
  EXPECT_LT(KOVAShareNamePathGet(photo.c_str(), small, sizeof(small), path, sizeof(path)), 0) << "name does not fit";
}

TEST_F(PlatformContractTest, EnumerationIsInByteOrderAndHonoursTheFilter) {
  SetShares({{"b", Folder("b")}, {"a", Folder("a"), "e"}, {"B", Folder("B")}, {"\xc3\xa4", Folder("\xc3\xa4")}});
  const KOVAShareFilter filters[] = {{0}, {1}};
  const std::vector<string> expected[] = {{"B", "a", "b", "\xc3\xa4"}, {"B", "b", "\xc3\xa4"}};
  for (const int i : {0, 1}) {
    KLIBCSzList* list = KLIBCSzListAlloc(1);
    EXPECT_GE(KLIBShareEnum(&list, &filters[i]), 0);
    std::vector<string> names;
    for (int n = 0; n < list->count; ++n) names.emplace_back(KLIBCSzListGet(list, n));
    EXPECT_EQ(expected[i], names);
    EXPECT_EQ(nullptr, KLIBCSzListGet(list, list->count));
    EXPECT_EQ(nullptr, KLIBCSzListGet(list, -1));
    KLIBCSzListFree(list);
  }
}

/// The flags of a share as ShareSetup has them.
string Flags(const char* name) {
  KOVAShare* share = nullptr;
  if (KOVAShareGet(name, &share) < 0) return "?";
  string letters;
  for (const auto& [letter, get] : {std::pair{'r', &KLIBShareRecycleStatusGet},
                                    {'e', &KLIBShareIsEncryptionGet},
                                    {'l', &KLIBShareIsEncryptedGet},
                                    {'o', &KLIBShareIsReadOnlyGet},
                                    {'h', &KLIBShareHideUnreadableGet}}) {
    int value = -1;
    EXPECT_GE(get(share, &value), 0) << letter;
    if (value == 1) letters += letter;
  }
  KOVAShareFree(share);
  return letters;
}

TEST_F(PlatformContractTest, EachFlagIsItsOwn) {
  std::vector<ShareSetup> shares;
  for (const string flags : {"", "r", "e", "el", "o", "h"}) shares.push_back({"s" + flags, Folder("s" + flags), flags});
  SetShares(shares);
  for (const ShareSetup& share : shares) EXPECT_EQ(share.flags, Flags(share.name.c_str()));
}

TEST_F(PlatformContractTest, OnlyTheFolderAtTheTopIsTheRecycleBin) {
  const string share = Folder("photo");
  SetShares({{"photo", share, "r"}, {"plain", Folder("plain")}});
  EXPECT_EQ(1, KOVAShareIsShareRecycle((share + "/#recycle").c_str()));
  EXPECT_EQ(1, KOVAShareIsShareRecycle((share + "/#recycle/a/b").c_str()));
  EXPECT_NE(1, KOVAShareIsShareRecycle((share + "/#recycled").c_str()));
  EXPECT_NE(1, KOVAShareIsShareRecycle((share + "/sub/#recycle/a").c_str()));
  EXPECT_NE(1, KOVAShareIsShareRecycle((dir_ / "plain/#recycle/a").c_str()));
}

using Compose = int (*)(const char*, char*, size_t);

string Composed(Compose compose, const string& share_path) {
  char buffer[4096];
  return compose(share_path.c_str(), buffer, sizeof(buffer)) < 0 ? "-" : buffer;
}

TEST_F(PlatformContractTest, NoTwoSharesHaveTheSameIndexFiles) {
  const string name_240(240, 'n');
  // Folders and characters of the escape, letter case, the suffixes of the files themselves, and names that are cut.
  const std::vector<string> paths = {"/v/a",     "/v/a/b",         "/v/a+b",         "/v+a",
                                     "/v/a%2Bb", "/v/A",           "/v/a.tmp",       "/v/a.queue.tmp",
                                     "/v/\xff",  "/v/" + name_240, "/w/" + name_240, "/v/" + name_240 + "m"};
  std::set<string> seen;
  for (const Compose compose : {&FILEIDXQueuePathCompose, &FILEIDXDBPathCompose}) {
    for (const string& path : paths) {
      const string composed = Composed(compose, path);
      EXPECT_TRUE(seen.insert(composed).second) << composed;
      EXPECT_TRUE(seen.insert(composed + ".tmp").second) << "the detached queue of " << path;
      EXPECT_LE(composed.size() - composed.rfind('/'), 240U) << "no room for a suffix: " << composed;
      EXPECT_EQ(0U, composed.find(TestRoot() + "/")) << composed;
      EXPECT_TRUE(std::filesystem::is_directory(composed.substr(0, composed.rfind('/'))));
    }
  }
  EXPECT_EQ(Composed(&FILEIDXQueuePathCompose, "/v/a"), Composed(&FILEIDXQueuePathCompose, "/v/a/"));
  EXPECT_EQ("srv+C%2B%2B%20tips", kova::EscapeSharePath("/srv/C++ tips")) << "the form on disk never changes";
  EXPECT_EQ("-", Composed(&FILEIDXQueuePathCompose, "v/a"));
  EXPECT_EQ("-", Composed(&FILEIDXDBPathCompose, ""));
  char id[15];
  EXPECT_LT(FILEIDXGetIndexID("photo", id, sizeof(id)), 0) << "one byte short";
  EXPECT_EQ("fileindex_photo", Composed(&FILEIDXGetIndexID, "photo"));
}

TEST_F(PlatformContractTest, RootIsAUserAndAnAdministrator) {
  KOVAUser* user = nullptr;
  for (const bool by_name : {true, false}) {
    ASSERT_GE(by_name ? KOVAUserGet("root", &user) : KOVAUserGetByUID(0, &user), 0);
    EXPECT_EQ("root", string(user->name));
    EXPECT_EQ(0U, user->uid);
    KOVAUserFree(user);
  }
  EXPECT_EQ(1, KLIBGroupIsAdminGroupMem("root", 0));
  EXPECT_LT(KOVAUserGet("no-such-user-here", &user), 0);
  EXPECT_EQ(KOVA_ERR_NO_SUCH_USER, KLIBCErrGet());
  EXPECT_LT(KLIBGroupIsAdminGroupMem("no-such-user-here", 0), 0);
  EXPECT_LT(KOVAUserGetByUID(3999999999U, &user), 0);
  EXPECT_FALSE(ResetCredentialsByName("no-such-user-here", true));
  EXPECT_TRUE(ResetCredentialsByName("root", true));
}

TEST_F(PlatformContractTest, CopyAndMoveKeepContentAndRefuseToOverwriteUnasked) {
  const string src = dir_ / "src", dst = dir_ / "dst";
  const string big(300 * 1024, 'x');
  WriteFile(src, big);
  KOVAFileCopyOptions options = {};
  ASSERT_EQ(0, KOVAFileCopy(src.c_str(), dst.c_str(), &options, 1));
  EXPECT_EQ(big, ReadFile(dst));
  EXPECT_EQ(big, ReadFile(src));
  WriteFile(src, "new");
  EXPECT_LT(KOVAFileCopy(src.c_str(), dst.c_str(), &options, 1), 0) << "overwrote without being asked to";
  EXPECT_EQ(big, ReadFile(dst));
  options.words[0] = 1;
  options.words[1] = 1;
  ASSERT_EQ(0, KOVAFileCopy(src.c_str(), dst.c_str(), &options, 1));
  EXPECT_EQ("new", ReadFile(dst));
  EXPECT_FALSE(std::filesystem::exists(src));
  EXPECT_LT(KOVAFileCopy(src.c_str(), dst.c_str(), &options, 1), 0) << "the source is gone";
  EXPECT_EQ("new", ReadFile(dst));
}

using kovadaemon::DomainSockConnection;

/// The message as it is on the wire.
string Frame(const string& message) {
  const auto length = static_cast<uint32_t>(message.size());
  return string(reinterpret_cast<const char*>(&length), sizeof(length)) + message;
}

/// Reads one message and writes what `reply` makes of it as it stands, the first bytes one by one, so that short reads
/// are tested too.
UnixServer Peer(const string& path, std::function<string(const string&)> reply) {
  return UnixServer(path, [reply = std::move(reply)](int fd) {
    uint32_t length = 0;
    (void)recv(fd, &length, sizeof(length), MSG_WAITALL);
    string request(length, '\0');
    if (length > 0) (void)recv(fd, request.data(), length, MSG_WAITALL);
    const string answer = reply(request);
    for (size_t sent = 0, piece = 0; sent < answer.size(); sent += piece) {
      piece = sent < 6 ? 1 : answer.size() - sent;
      if (send(fd, answer.data() + sent, piece, MSG_NOSIGNAL) != static_cast<ssize_t>(piece)) return;
    }
  });
}

TEST_F(PlatformContractTest, MessagesPassWholeAndInPieces) {
  // Lengths around the step in which a receiver grows, and an answer that comes byte by byte.
  for (const size_t size : {size_t{0}, size_t{1}, size_t{65535}, size_t{65536}, size_t{65537}, size_t{3000000}}) {
    const string message(size, 'm');
    const UnixServer peer = Peer(dir_ / "sock", [](const string& request) { return Frame(request); });
    DomainSockConnection connection(dir_ / "sock");
    ASSERT_TRUE(connection.Connect());
    ASSERT_TRUE(connection.Send(message)) << size;
    string answer = "old";
    ASSERT_TRUE(connection.Recv(answer)) << size;
    EXPECT_TRUE(answer == message) << size;
  }
}

TEST_F(PlatformContractTest, ABadPeerIsAFailedCall) {
  const string half = Frame("0123456789").substr(0, 9);
  const string huge = string(4, '\xff') + "abc";
  for (const string& reply : {string(), string("\1\0", 2), half, huge}) {
    const UnixServer peer = Peer(dir_ / "sock", [&](const string&) { return reply; });
    DomainSockConnection connection(dir_ / "sock");
    ASSERT_TRUE(connection.Connect());
    ASSERT_TRUE(connection.Send("x"));
    string answer;
    EXPECT_FALSE(connection.Recv(answer)) << reply.size();
  }
  DomainSockConnection nobody(dir_ / "no-such-socket");
  EXPECT_FALSE(nobody.Connect());
  EXPECT_FALSE(nobody.Send("x"));
  EXPECT_FALSE(DomainSockConnection(string(200, 'p')).Connect());
}

TEST_F(PlatformContractTest, AMessageOverTheLimitIsNotSent) {
  const UnixServer peer = Peer(dir_ / "sock", [](const string& request) { return Frame(request + "123456"); });
  DomainSockConnection connection(dir_ / "sock");
  connection.SetMessageLimit(10);
  ASSERT_TRUE(connection.Connect());
  EXPECT_FALSE(connection.Send("12345678901"));
  ASSERT_TRUE(connection.Send("12345")) << "the refused message left something in the stream";
  string answer;
  EXPECT_FALSE(connection.Recv(answer)) << "eleven bytes are over the limit";
}

}  // namespace
}  // namespace ferrox::test
