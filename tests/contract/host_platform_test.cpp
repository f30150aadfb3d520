// What only the Linux host promises: the share table, identities, and what the kernel tells of file systems.

#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include <kova/error.h>
#include <kova/fs.h>
#include <kova/instance.h>
#include <kova/recycle.h>
#include <kova/share.h>
#include <kova/user.h>

#include "platform/host/account_source.h"
#include "platform/host/share_table.h"
#include "platform/host/synonyms.h"
#include "tests/contract/in_child.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

using kova::host::AddShare;
using kova::host::ListShares;
using kova::host::RemoveShare;
using kova::host::ShareTablePath;
using std::string;

class HostPlatformTest : public testing::Test {
 protected:
  void SetUp() override { std::filesystem::remove_all(TestRoot() + "/etc/kova"); }

  string Folder(const string& path) {
    std::filesystem::create_directories(dir_ / path);
    return dir_ / path;
  }
  /// The sentence with which a share is refused; empty when it was added.
  static string Refusal(const string& name, const string& path) {
    try {
      AddShare({name, path});
    } catch (const kova::host::ShareTableError& error) {
      return error.what();
    }
    return {};
  }

  TempDir dir_;
};

TEST_F(HostPlatformTest, AShareThatCannotBeIsRefusedWithTheRemedy) {
  const string photo = Folder("photo");
  std::filesystem::create_directory_symlink(photo, dir_ / "link");
  WriteFile(dir_ / "file", "x");
  const string state = TestRoot() + "/var/lib/kova/inside";
  std::filesystem::create_directories(state);
  ASSERT_EQ("", Refusal("photo", photo));
  const struct {
    string name, path, sentence;
  } rows[] = {
      {"", photo, "no name"},
      {"..", photo, "choose another"},
      {"a/b", photo, "cannot hold \"/\""},
      {"a\nb", Folder("a\nb"), "control characters"},
      {string(256, 'n'), photo, "over 255 bytes"},
      {"photo", "photo", "not absolute"},
      {"Photo", photo, "(upper and lower case count)"},
      {"pictures", photo, "mount --bind '" + photo + "' /srv/pictures"},
      {"gone", dir_ / "gone", "does not exist; make it first"},
      {"file", dir_ / "file", "is not a folder"},
      {"link", dir_ / "link", "share " + photo + " under the name \"photo\""},
      {"photo", dir_ / "x/../photo", "goes through a link or is not in its plain form"},
      {"inside", state, "the index's own files"},
      {"photo", Folder("other/photo"), "there is a share \"photo\" already, at " + photo},
  };
  std::filesystem::create_directory(dir_ / "x");
  for (const auto& row : rows) {
    const string refusal = Refusal(row.name, row.path);
    EXPECT_NE(string::npos, refusal.find(row.sentence)) << row.name << " " << row.path << "\n  " << refusal;
  }
  EXPECT_EQ(1U, ListShares().size());
  EXPECT_EQ("", Refusal("inner", Folder("photo/inner"))) << "a share may lie in another";
  RemoveShare("photo");
  EXPECT_THROW(RemoveShare("photo"), kova::host::ShareTableError);
  EXPECT_EQ("inner", ListShares().at(0).name);
}

TEST_F(HostPlatformTest, TheTableIsReadAgainWhenSomebodyElseChangesIt) {
  const string a = Folder("a");
  KOVAShare* share = nullptr;
  EXPECT_LT(KOVAShareGet("a", &share), 0);
  const auto write = [](const string& text) { WriteFile(ShareTablePath(), text); };
  write("[{\"name\":\"a\",\"path\":\"" + a + "/\",\"recycle\":\".Bin\",\"comment\":\"kept\",\"ftp_privilege\":1}]");
  ASSERT_GE(KOVAShareGet("a", &share), 0);
  EXPECT_EQ(a, share->path) << "without the trailing slash";
  EXPECT_EQ(1U, share->ftp_privilege);
  KOVAShareFree(share);
  EXPECT_EQ(1, KOVAShareIsShareRecycle((a + "/.Bin/x").c_str()));
  ASSERT_EQ("", Refusal("b", Folder("b")));
  EXPECT_NE(string::npos, ReadFile(ShareTablePath()).find("kept")) << "what it does not know it must not drop";
  for (const string& bad : {string("{}"), string("[1]"), string("["), string("[{\"name\":\"a\"}]"),
                            "[{\"name\":\"b\",\"path\":\"" + a + "\"}]", string(100000, '['),
                            "[{\"name\":\"a\",\"path\":\"" + a + "\"},{\"name\":\"a\",\"path\":\"/x/a\"}]",
                            "[{\"name\":\"a\",\"path\":\"" + a + "\",\"encrypted\":1}]"}) {
    write(bad);
    EXPECT_LT(KOVAShareGet("a", &share), 0) << bad.substr(0, 80);
    EXPECT_EQ(KOVA_ERR_BAD_CONFIGURATION, KLIBCErrGet());
    EXPECT_NE(string::npos, Refusal("c", Folder("c")).find(ShareTablePath())) << bad.substr(0, 80);
    EXPECT_EQ(bad, ReadFile(ShareTablePath())) << "a table that cannot be read must not be replaced";
  }
}

TEST_F(HostPlatformTest, BadLinesOfTheSynonymsLeaveTheOthersWorking) {
  const auto told = [](const string& text) {
    WriteFile(kova::host::SynonymsPath(), text);
    const std::shared_ptr<const kova::host::SynonymList> list = kova::host::GetSynonyms();
    string read = std::to_string(list->rules.size());
    for (const string& problem : list->problems) read += "; " + problem;
    return read;
  };
  EXPECT_EQ("0", told(""));
  EXPECT_EQ(
      "2; line 3 has one word alone; line 4 lacks the words on one side of \"=>\"; line 5 lacks a word beside a comma;"
      " line 6 is not text in UTF-8; line 7 has more than one \"=>\"; line 8 has a word without a letter",
      told("# cars\ncar, automobile,auto # equal\none\n => tv\na,,b\n\xFF, b\na => b => c\n-, b\r\n\ttv=>hard disk "
           "\r\n"));
  const kova::host::SynonymList two = kova::host::ReadSynonyms("tv => television, big tv");
  EXPECT_EQ(kova::host::SynonymRule({"tv"}, {"television", "big tv"}), two.rules.at(0));
  string many;
  for (int i = 0; i < 1001; ++i) many += "a, b\n";
  EXPECT_EQ("1000; line 1001 and what follows do not count: a list has at most 1,000 lines", told(many));
  EXPECT_EQ("0; the file has more than 64 KiB", told(string(65537, '#')));
}

TEST_F(HostPlatformTest, ARenamedOrMovedShareKeepsItsFlags) {
  kova::host::ShareEntry entry = {"photo", Folder("photo"), ".Bin"};
  entry.hide_unreadable = true;
  AddShare(entry);
  AddShare({"music", Folder("music")});
  const auto refusal = [](const string& from, const string& name, const string& path) -> string {
    try {
      kova::host::RenameShare(from, name, path);
    } catch (const kova::host::ShareTableError& error) {
      return error.what();
    }
    return {};
  };
  const struct {
    string from, name, path, sentence;
  } refused[] = {
      {"gone", "x", Folder("x"), "there is no share \"gone\""},
      {"photo", "music", Folder("other/music"), "there is a share \"music\" already"},
      {"photo", "pictures", dir_ / "photo", "the folder " + (dir_ / "photo") + " is called \"photo\""},
      {"photo", "pictures", dir_ / "pictures", "does not exist; make it first"},
  };
  const string before = ReadFile(ShareTablePath());
  for (const auto& row : refused) {
    const string sentence = refusal(row.from, row.name, row.path);
    EXPECT_NE(string::npos, sentence.find(row.sentence)) << sentence;
    EXPECT_EQ(before, ReadFile(ShareTablePath()));
  }
  EXPECT_EQ("", refusal("photo", "pictures", Folder("pictures")));
  kova::host::MoveShare("pictures", Folder("v2/pictures"));
  const auto shares = ListShares();
  ASSERT_EQ(2U, shares.size());
  EXPECT_EQ("pictures", shares[1].name);
  EXPECT_EQ(dir_ / "v2/pictures", shares[1].path);
  EXPECT_EQ(".Bin", shares[1].recycle);
  EXPECT_TRUE(shares[1].hide_unreadable);
}

TEST_F(HostPlatformTest, ConcurrentChangesAreAllKept) {
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([this, t] {
      for (int i = 0; i < 10; ++i) {
        const string name = "s" + std::to_string(t) + "-" + std::to_string(i);
        AddShare({name, Folder(name)});
        (void)chmod((ShareTablePath() + ".lock").c_str(), 0644);  // so that whoever comes next replaces it
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(40U, ListShares().size());
}

TEST_F(HostPlatformTest, AccountsOfTheNetworkAreToldApart) {
  using kova::host::NetworkSource;
  const string winbind = "group: files sss\npasswd:\tfiles winbind # sss\n", both = "passwd: files sss winbind\n";
  EXPECT_EQ(AUTH_DOMAIN, NetworkSource("ann", winbind));
  EXPECT_EQ(AUTH_LDAP, NetworkSource("ann", both));
  EXPECT_EQ(AUTH_LDAP, NetworkSource("ann", ""));
  EXPECT_EQ(AUTH_DOMAIN, NetworkSource("OFFICE\\ann", both));
  EXPECT_EQ(AUTH_DOMAIN, NetworkSource("ann@office", both));
}

TEST_F(HostPlatformTest, PrivilegesFollowModeBits) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root to make another user's folder";
  AddShare({"p", Folder("p")});
  KOVAShare* share = nullptr;
  ASSERT_GE(KOVAShareGet("p", &share), 0);
  const struct {
    mode_t mode;
    uid_t owner;
    int privilege;
  } rows[] = {{0755, 0, KOVA_PRIV_READ_ONLY},
              {0700, 0, KOVA_PRIV_DENIED},
              {0777, 0, KOVA_PRIV_READ_WRITE},
              {0700, 65534, KOVA_PRIV_READ_WRITE},
              {0077, 65534, KOVA_PRIV_DENIED}};
  for (const auto& row : rows) {
    ASSERT_EQ(0, chmod(share->path, row.mode));
    ASSERT_EQ(0, chown(share->path, row.owner, 0));
    EXPECT_EQ(row.privilege, KOVAShareUserPrivGet("nobody", share)) << std::oct << row.mode;
  }
  EXPECT_EQ(KOVA_PRIV_READ_WRITE, KOVAShareUserPrivGet("root", share));
  EXPECT_LT(KOVAShareUserPrivGet("no-such-user-here", share), 0);
  KOVAShareFree(share);
}

TEST_F(HostPlatformTest, RootBecomesAnybodyAndComesBack) {
  if (geteuid() != 0) GTEST_SKIP() << "not root";
  (void)InChild(false, [] {
    EXPECT_TRUE(ResetCredentialsByName("nobody", true));
    EXPECT_EQ(65534U, geteuid());
    EXPECT_FALSE(ResetCredentialsByName("no-such-user-here", true));
    EXPECT_EQ(65534U, geteuid());
    EXPECT_EQ(0, KOVAACLPermGet("/etc/shadow")) << "the effective user counts";
    EXPECT_TRUE(ResetCredentialsByName("root", true)) << "from another effective user";
    EXPECT_EQ(0U, geteuid());
    EXPECT_EQ(0U, getegid());
  });
}

TEST_F(HostPlatformTest, AnOrdinaryInstanceBelongsToItsOwner) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root to become an ordinary process";
  (void)InChild(false, [] {
    ASSERT_EQ(0, setresgid(65534, 65534, 65534));
    ASSERT_EQ(0, setresuid(65534, 65534, 65534));
    EXPECT_TRUE(ResetCredentialsByName("root", true));
    EXPECT_TRUE(ResetCredentialsByName("nobody", true));
    EXPECT_FALSE(ResetCredentialsByName("daemon", true));
    EXPECT_EQ(65534U, geteuid());
  });
}

TEST_F(HostPlatformTest, FileSystemsAreToldApart) {
  EXPECT_EQ(KOVA_FS_PSEUDO, KOVAGetFSType("/proc/self", 0));
  EXPECT_NE(KOVA_FS_PSEUDO, KOVAGetFSType(dir_.Path().c_str(), 0));
  EXPECT_LT(KOVAGetFSType((dir_ / "missing").c_str(), 0), 0);
  EXPECT_EQ(1, KOVAFSDirIsMntPoint("/proc"));
  EXPECT_EQ(0, KOVAFSDirIsMntPoint(dir_.Path().c_str()));
  EXPECT_EQ(0, KOVAFSDirIsMntPoint("/proc/version"));
  EXPECT_LT(KOVAFSDirIsMntPoint((dir_ / "missing").c_str()), 0);
}

int InSnapshot(const string& path) {
  int flag = -1;
  EXPECT_EQ(0, KLIBFhsPathInSnapshot(path.c_str(), &flag));
  return flag;
}

TEST_F(HostPlatformTest, MountsAndSnapshots) {
  const string share = Folder("data"), snapshot = Folder("data/#snapshot/today"), fake = Folder("fake/#snapshot/today");
  const bool ran = InChild(true, [&] {
    ASSERT_EQ(0, mount("tmpfs", share.c_str(), "tmpfs", 0, "size=1m"));
    EXPECT_EQ(KOVA_FS_TMPFS, KOVAGetFSType(share.c_str(), 0));
    EXPECT_EQ(1, KOVAFSDirIsMntPoint(share.c_str()));
    AddShare({"data", share});
    EXPECT_EQ(0, KOVAFSDirIsMntPoint(share.c_str())) << "a mounted volume may be a share";
    std::filesystem::create_directories(snapshot);
    EXPECT_EQ(0, InSnapshot(snapshot + "/f")) << "the name alone is no snapshot";
    ASSERT_EQ(0, mount("tmpfs", snapshot.c_str(), "tmpfs", MS_RDONLY, nullptr));
    EXPECT_EQ(1, InSnapshot(snapshot + "/f"));
    EXPECT_EQ(1, InSnapshot(snapshot));
    EXPECT_EQ(0, InSnapshot(share));
    EXPECT_EQ(1, KOVAFSDirIsMntPoint(snapshot.c_str())) << "a mount inside a share";
    EXPECT_EQ(0, InSnapshot(fake + "/f"));

    EXPECT_EQ(1, KOVAQuotaIsEnough(0, share.c_str(), 1000));
    EXPECT_EQ(0, KOVAQuotaIsEnough(0, share.c_str(), 100 << 20));
    EXPECT_EQ(KOVA_ERR_OUT_OF_SPACE, KLIBCErrGet());
    EXPECT_EQ(0, KOVAQuotaIsEnough(0, (dir_ / "missing").c_str(), 1));
    EXPECT_EQ(KOVA_ERR_SYSTEM, KLIBCErrGet());

    // Moving between file systems copies, and leaves nothing behind when the target is full.
    WriteFile(dir_ / "file", "content");
    ASSERT_EQ(0, chmod((dir_ / "file").c_str(), 0640));
    KOVAFileCopyOptions move = {};
    move.words[0] = move.words[1] = 1;
    ASSERT_EQ(0, KOVAFileCopy((dir_ / "file").c_str(), (share + "/file").c_str(), &move, 1));
    EXPECT_EQ("content", ReadFile(share + "/file"));
    struct stat info = {};
    EXPECT_EQ(0, stat((share + "/file").c_str(), &info));
    EXPECT_EQ(0640U, info.st_mode & 07777);
    EXPECT_FALSE(std::filesystem::exists(dir_ / "file"));
    WriteFile(dir_ / "big", string(3 << 20, 'b'));
    EXPECT_LT(KOVAFileCopy((dir_ / "big").c_str(), (share + "/file").c_str(), &move, 1), 0);
    EXPECT_EQ(KOVA_ERR_OUT_OF_SPACE, KLIBCErrGet());
    EXPECT_EQ("content", ReadFile(share + "/file"));
    EXPECT_TRUE(std::filesystem::exists(dir_ / "big"));
    std::filesystem::remove_all(share + "/#snapshot/../file");
    for (const auto& entry : std::filesystem::directory_iterator(share)) {
      EXPECT_EQ("#snapshot", entry.path().filename()) << "left behind";
    }
  });
  if (!ran) GTEST_SKIP() << "this system does not let the test mount";
}

}  // namespace
}  // namespace ferrox::test
