// What every implementation of the platform promises. Built once for the fake and once for the Linux host.

#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include <kova/error.h>
#include <kova/file_index.h>
#include <kova/fs.h>
#include <kova/notifyd.h>
#include <kova/recycle.h>
#include <kova/samba.h>
#include <kova/share.h>
#include <kova/sock_connection.h>
#include <kova/user.h>

#include "platform/shared/index_paths.h"
#include "platform/shared/records.h"
#include "tests/contract/frame_peer.h"
#include "tests/contract/platform_setup.h"
#include "tests/support/temp_dir.h"

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
  SetShares(
      {{"b", Folder("b")}, {"a", Folder("a"), false, true}, {"B", Folder("B")}, {"\xc3\xa4", Folder("\xc3\xa4")}});
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

/// The flags of a share as letters.
string Flags(const char* name) {
  KOVAShare* share = nullptr;
  if (KOVAShareGet(name, &share) < 0) return "?";
  const struct {
    char letter;
    int (*get)(const KOVAShare*, int*);
  } flags[] = {{'r', &KLIBShareRecycleStatusGet},
               {'e', &KLIBShareIsEncryptionGet},
               {'l', &KLIBShareIsEncryptedGet},
               {'o', &KLIBShareIsReadOnlyGet},
               {'h', &KLIBShareHideUnreadableGet}};
  string letters;
  for (const auto& flag : flags) {
    int value = -1;
    EXPECT_GE(flag.get(share, &value), 0) << flag.letter;
    if (value == 1) letters += flag.letter;
  }
  KOVAShareFree(share);
  return letters;
}

TEST_F(PlatformContractTest, EachFlagIsItsOwn) {
  SetShares({{"none", Folder("none")},
             {"r", Folder("r"), true},
             {"e", Folder("e"), false, true},
             {"el", Folder("el"), false, true, true},
             {"o", Folder("o"), false, false, false, true},
             {"h", Folder("h"), false, false, false, false, true}});
  EXPECT_EQ("", Flags("none"));
  for (const char* name : {"r", "e", "el", "o", "h"}) EXPECT_EQ(name, Flags(name));
}

TEST_F(PlatformContractTest, OnlyTheFolderAtTheTopIsTheRecycleBin) {
  const string share = Folder("photo");
  SetShares({{"photo", share, true}, {"plain", Folder("plain")}});
  EXPECT_EQ(1, KOVAShareIsShareRecycle((share + "/#recycle").c_str()));
  EXPECT_EQ(1, KOVAShareIsShareRecycle((share + "/#recycle/a/b").c_str()));
  EXPECT_NE(1, KOVAShareIsShareRecycle((share + "/#recycled").c_str()));
  EXPECT_NE(1, KOVAShareIsShareRecycle((share + "/sub/#recycle/a").c_str()));
  EXPECT_NE(1, KOVAShareIsShareRecycle((dir_ / "plain/#recycle/a").c_str()));
}

using Enumerate = int (*)(KLIBCSzList**);

/// What an enumeration appends, in order of the texts.
std::set<string> Enumerated(const Enumerate enumerate) {
  KLIBCSzList* list = KLIBCSzListAlloc(1);
  const int count = enumerate(&list);
  std::set<string> texts;
  for (int i = 0; i < list->count; ++i) texts.insert(KLIBCSzListGet(list, i));
  EXPECT_EQ(count, static_cast<int>(texts.size()));
  KLIBCSzListFree(list);
  return texts;
}

TEST_F(PlatformContractTest, HomeRecycleBinsByTheKindOfTheirOwnersAccount) {
  const Enumerate every = &KOVARecycleHomeEnumRecyclePath;
  const Enumerate local = [](KLIBCSzList** list) {
    return KOVARecycleHomeEnumRecyclePathForAuthType(list, AUTH_LOCAL);
  };
  const Enumerate others = [](KLIBCSzList** list) {
    return KOVARecycleHomeEnumRecyclePathForAuthType(list, static_cast<AUTH_TYPE>(AUTH_DOMAIN | AUTH_LDAP));
  };
  EXPECT_TRUE(Enumerated(every).empty()) << "there is no share \"homes\"";
  const std::vector<string> bins = SetHomes(Folder("homes"));
  EXPECT_EQ(std::set<string>(bins.begin(), bins.end()), Enumerated(every));
  EXPECT_EQ(std::set<string>{bins[0]}, Enumerated(local));
  EXPECT_TRUE(Enumerated(others).empty());
  EXPECT_LT(KOVARecycleHomeEnumRecyclePath(nullptr), 0);
}

TEST_F(PlatformContractTest, SpotlightIsOnWhenItIsOnInEveryShare) {
  SetShares({{"photo", Folder("photo")}, {"music", Folder("music")}});
  SetSpotlight({{"photo", true}, {"music", false}});
  EXPECT_EQ(0, KOVASMBIsEnableSpotlight());
  EXPECT_EQ(0, KOVASMBSetSpotlight(1));
  EXPECT_EQ(1, KOVASMBIsEnableSpotlight());
  EXPECT_EQ(0, KOVASMBSetSpotlight(1)) << "it is on already";
  EXPECT_EQ(0, KOVASMBSetSpotlight(0));
  EXPECT_EQ(0, KOVASMBIsEnableSpotlight());
}

Json::Value MonitorDocument(const string& queue, const std::vector<string>& folders) {
  Json::Value document;
  document["queue"] = queue;
  document["config"] = Json::arrayValue;
  for (const string& folder : folders) {
    Json::Value watch;
    watch["path"] = folder;
    watch["mask"] = 65478;
    watch["ignore"].append("@eaDir");
    document["config"].append(watch);
  }
  return document;
}

/// "application type queue: folders" of each registration.
std::multiset<string> Registered() {
  std::multiset<string> texts;
  for (const auto& [application, type, document] : RegisteredQueues()) {
    string text = application + " " + std::to_string(type) + " " + document["queue"].asString() + ":";
    for (const Json::Value& watch : document["config"]) {
      text += " " + watch["path"].asString();
      EXPECT_EQ(65478U, watch["mask"].asUInt());
      EXPECT_EQ("@eaDir", watch["ignore"][0].asString());
    }
    texts.insert(text);
  }
  return texts;
}

using KOVA::KOVANOTIFYD::MonitorQueue;
constexpr int kType = KOVA::KOVANOTIFYD::MONITOR_QUEUE_TYPE_APPLICATION;

bool Register(const Json::Value& document, const string& application = "fileindex", int type = kType) {
  return MonitorQueue::Upsert(MonitorQueue(document), application, type);
}

TEST_F(PlatformContractTest, AQueueIsRegisteredByItsPathApplicationAndType) {
  const string odd = "/v/q\xff \"\\\n";
  EXPECT_TRUE(Register(MonitorDocument("/v/q", {"/v/a", odd})));
  EXPECT_TRUE(Register(MonitorDocument("/v/q", {}), "other"));
  EXPECT_TRUE(Register(MonitorDocument("/v/q", {}), "fileindex", 2));
  EXPECT_TRUE(Register(MonitorDocument(odd, {})));
  EXPECT_EQ((std::multiset<string>{"fileindex 1 /v/q: /v/a " + odd,
                                   "other 1 /v/q:", "fileindex 2 /v/q:", "fileindex 1 " + odd + ":"}),
            Registered());
  EXPECT_TRUE(Register(MonitorDocument("/v/q", {"/v/b", "/v/c/"})))
      << "in place of the first, without what cannot be watched";
  EXPECT_TRUE(MonitorQueue::Delete("/v/q", "other", kType));
  EXPECT_TRUE(MonitorQueue::Delete("/v/q", "other", kType)) << "there is none any more";
  EXPECT_TRUE(MonitorQueue::Delete("/v/q", "fileindex", 2));
  EXPECT_TRUE(MonitorQueue::Delete(odd, "fileindex", kType));
  EXPECT_EQ(std::multiset<string>{"fileindex 1 /v/q: /v/b"}, Registered());
  EXPECT_TRUE(MonitorQueue::Delete("/v/q", "fileindex", kType));
}

TEST_F(PlatformContractTest, ABadRegistrationIsRefusedWholeAndChangesNothing) {
  const Json::Value good = MonitorDocument("/v/q", {"/v/a", "/v/b"});
  ASSERT_TRUE(Register(good));
  const auto with = [&](const std::function<void(Json::Value&)>& change) {
    Json::Value document = MonitorDocument("/v/q", {"/v/c", "/v/d"});
    change(document);
    return document;
  };
  const Json::Value bad[] = {
      Json::Value(),
      Json::Value(Json::arrayValue),
      with([](Json::Value& d) { d["queue"] = "v/q"; }),
      with([](Json::Value& d) { d.removeMember("queue"); }),
      with([](Json::Value& d) { d["config"] = Json::nullValue; }),
      with([](Json::Value& d) { d["config"][1] = "/v/d"; }),
      with([](Json::Value& d) { d["config"][1]["path"] = "v/d"; }),
      with([](Json::Value& d) { d["config"][1]["path"] = string("/v/d\0e", 6); }),
      with([](Json::Value& d) { d["config"][1]["mask"] = -1; }),
      with([](Json::Value& d) { d["config"][1].removeMember("ignore"); }),
      with([](Json::Value& d) { d["config"][1]["ignore"] = "@eaDir"; }),
      with([](Json::Value& d) { d["config"][1]["ignore"].append("a/b"); }),
      with([](Json::Value& d) { d["config"][1]["ignore"].append(".."); }),
  };
  for (const Json::Value& document : bad) {
    EXPECT_FALSE(Register(document)) << document.toStyledString();
    EXPECT_EQ(KOVA_ERR_BAD_PARAMETER, KLIBCErrGet());
    EXPECT_EQ(std::multiset<string>{"fileindex 1 /v/q: /v/a /v/b"}, Registered());
  }
  EXPECT_TRUE(MonitorQueue::Delete("/v/q", "fileindex", kType));
}

using Compose = int (*)(const char*, char*, size_t);

string Composed(Compose compose, const string& share_path) {
  char buffer[4096];
  return compose(share_path.c_str(), buffer, sizeof(buffer)) < 0 ? "-" : buffer;
}

TEST_F(PlatformContractTest, NoTwoSharesHaveTheSameIndexFiles) {
  const string name_240(240, 'n');
  const std::vector<string> paths = {
      "/v/a",
      "/v/a/b",
      "/v/a+b",
      "/v+a",
      "/v/a%2Bb",
      "/v/A",
      "/v/a.tmp",
      "/v/.a",
      "/v/a.queue",
      "/v/a.queue.tmp",
      "/v/a\nb",
      "/v/a b",
      "/v/\xff",
      "/v/%FF",
      "/v/" + name_240,
      "/w/" + name_240,
      "/v/" + name_240 + "m",
      "/v/~a",
  };
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
  ASSERT_GE(KOVAUserGet("root", &user), 0);
  EXPECT_EQ(0U, user->uid);
  EXPECT_EQ("root", string(user->name));
  KOVAUserFree(user);
  ASSERT_GE(KOVAUserGetByUID(0, &user), 0);
  EXPECT_EQ("root", string(user->name));
  KOVAUserFree(user);
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

TEST_F(PlatformContractTest, FileSystemClasses) {
  const struct {
    int type, remote, image;
  } rows[] = {{KOVA_FS_EXT, 0, 0},     {KOVA_FS_PSEUDO, 0, 0},       {KOVA_FS_FUSE, 0, 0},    {KOVA_FS_NFS, 1, 0},
              {KOVA_FS_CIFS, 1, 0},    {KOVA_FS_FUSE_REMOTE, 1, 0},  {KOVA_FS_ISO9660, 0, 1}, {KOVA_FS_SQUASHFS, 0, 1},
              {KOVA_FS_UNKNOWN, 0, 0}, {KOVA_FS_OTHER_REMOTE, 1, 0}, {KOVA_FS_EROFS, 0, 1}};
  for (const auto& row : rows) {
    EXPECT_EQ(row.remote, KOVAFSIsRemoteFS(row.type)) << row.type;
    EXPECT_EQ(row.image, KOVAFSIsImageFS(row.type)) << row.type;
  }
  EXPECT_EQ(1, KOVAEAIsHiddenDir("@eaDir"));
  EXPECT_EQ(0, KOVAEAIsHiddenDir("@eadir"));
}

using kovadaemon::DomainSockConnection;

TEST_F(PlatformContractTest, MessagesPassWholeAndInPieces) {
  // Lengths around the step in which a receiver grows, and an answer that comes byte by byte.
  for (const size_t size : {size_t{0}, size_t{1}, size_t{65535}, size_t{65536}, size_t{65537}, size_t{3000000}}) {
    const string message(size, 'm');
    FramePeer peer(dir_ / "sock", [](const string& request) { return Frame(request); });
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
  const string huge(
      "\xff\xff\xff\xff"
      "abc",
      7);
  for (const string& reply : {string(), string("\1\0", 2), half, huge}) {
    FramePeer peer(dir_ / "sock", [&](const string&) { return reply; });
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
  FramePeer peer(dir_ / "sock", [](const string& request) { return Frame(request + "123456"); });
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
