// Samba's configuration on the Linux host: the Spotlight switch in its text, and its shares.

#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include <kova/error.h>
#include <kova/fs.h>
#include <kova/recycle.h>
#include <kova/samba.h>
#include <kova/share.h>

#include "platform/host/samba_shares.h"
#include "platform/host/share_search.h"
#include "platform/host/share_table.h"
#include "platform/host/share_users.h"
#include "platform/host/smb_conf.h"
#include "tests/contract/host_log.h"
#include "tests/contract/in_child.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

using kova::host::SmbConf;
using std::string;

TEST(SmbConfTest, ValuesAreReadAsSambaReadsThem) {
  const SmbConf conf(
      "server string = before any section\n"
      "[Global]\n  SpotLight=TRUE\n  # hidden = 1 \\\n  seen = 1\n ;x=1\n"
      "[ Photo   Album ] rest\n\tpath = \"/srv/Photo Album\" \n  Spot Light = off\n no value here\n"
      "[two\\\n lines]\r\n comment = one \\\r\n   two   three\\\n\n spotlight = 0\r\n"
      "[PHOTO album]\n hide unreadable = oN\n spotlight =\n"
      "[broken\n spotlight = no\n[last]\npath = /end\n[global]\nspotlight = 0\nlate = 1\n[later]\n");
  const struct {
    const char *section, *parameter, *value;
  } rows[] = {
      {"global", "server string", "before any section"},
      {"GLOBAL", "seen", "1"},
      {"global", "hidden", "-"},
      {"global", "x", "-"},
      {"photo album", "path", "\"/srv/Photo Album\""},
      {"photo  ALBUM ", "hideunreadable", "oN"},
      {"photo album", "spotlight", ""},
      {"two lines", "comment", "one two three"},
      {"two lines", "spotlight", "0"},
      {"last", "spotlight", "TRUE"},
      {"last", "path", "/end"},
      {"last", "late", "-"},
      {"later", "late", "1"},
      {"later", "spotlight", "0"},
      {"no such", "path", "-"},
  };
  for (const auto& row : rows)
    EXPECT_EQ(row.value, conf.Get(row.section, row.parameter).value_or("-")) << row.parameter;
  EXPECT_EQ((std::vector<string>{"Global", "Photo Album", "two lines", "last", "later"}), conf.Sections());
}

TEST(SmbConfTest, ASwitchChangesItsValueAndNothingElse) {
  const struct {
    string before, after;
    bool on = true;
  } rows[] = {
      {"[a]\n\tpath = /a\n", "[a]\n\tspotlight = yes\n\tpath = /a\n"},
      {"[a]", "[a]\n   spotlight = yes\n"},
      {"[a]\r\n  path = /a\r\n", "[a]\r\n  spotlight = yes\r\n  path = /a\r\n"},
      {"[a]\n# spotlight = no\n\n[d]\n x=1\n", "[a]\n   spotlight = yes\n# spotlight = no\n\n[d]\n x=1\n"},
      {"[A] ; rest\n Spot Light  =  off  \n x = 1\n", "[A] ; rest\n Spot Light  =  yes  \n x = 1\n"},
      {"[a]\nspotlight=0", "[a]\nspotlight= yes"},
      {"[a]\nspotlight=\n", "[a]\nspotlight= yes\n"},
      {"[a]\nspotlight = maybe\n", "[a]\nspotlight = yes\n"},
      {"[a]\nspotlight = \\\n  no\nx=1\n", "[a]\nspotlight = yes\nx=1\n"},
      {"[a]\nspotlight = true\n", "[a]\nspotlight = true\n"},
      {"[a]\nspotlight = yes\n[d]\n[a]\nspotlight = no\n", "[a]\nspotlight = yes\n[d]\n[a]\nspotlight = yes\n"},
      {"[global]\nspotlight = yes\n[a]\n x = 1\n", "[global]\nspotlight = yes\n[a]\n x = 1\n"},
      {"[global]\nspotlight = yes\n[a]\n x = 1\n", "[global]\nspotlight = yes\n[a]\n spotlight = no\n x = 1\n", false},
      {"[a]\n path = /a\n", "[a]\n path = /a\n", false},
      {"[a]\n include = /more\n[b]\nspotlight = 0\n",
       "[a]\n spotlight = yes\n include = /more\n[b]\nspotlight = yes\n"},
      {"[c]\nspotlight = no\n[", "[c]\nspotlight = no\n["},
  };
  for (const auto& row : rows)
    EXPECT_EQ(row.after, SmbConf(row.before).WithSwitch({"a", "B", "a"}, "spotlight", row.on));
}

class HostSambaTest : public testing::Test {
 protected:
  void SetUp() override {
    for (const char* folder : {"/etc/kova", "/etc/samba"}) std::filesystem::remove_all(TestRoot() + folder);
    kova::host::ExpectSambaChange();
    for (const char* name : {"photo", "music"}) kova::host::AddShare({name, Folder(name)});
  }

  string Folder(const string& path) {
    std::filesystem::create_directories(dir_ / path);
    return dir_ / path;
  }
  static void Configure(const string& members) {
    WriteFile(TestRoot() + "/etc/kova/kova.json", "{\"samba\": {" + members + "}}");
    kova::host::ExpectSambaChange();
  }
  /// A program that runs `script` as a shell does.
  string Program(const string& name, const string& script) {
    WriteFile(dir_ / name, "#!/bin/sh\n" + script);
    std::filesystem::permissions(dir_ / name, std::filesystem::perms(0755));
    return dir_ / name;
  }
  static bool IsShare(const string& name) {
    KOVAShare* share = nullptr;
    const bool found = KOVAShareGet(name.c_str(), &share) == 0;
    KOVAShareFree(share);
    return found;
  }

  const string conf_ = TestRoot() + "/etc/samba/smb.conf";
  TempDir dir_;
  HostLog log_;
};

TEST_F(HostSambaTest, WithoutAnythingToSwitchSpotlightIsNotSupported) {
  for (int i = 0; i < 3; ++i) {
    EXPECT_EQ(0, KOVASMBIsEnableSpotlight());
    EXPECT_LT(KOVASMBSetSpotlight(1), 0);
    EXPECT_EQ(KOVA_ERR_NOT_SUPPORTED, KLIBCErrGet());
  }
  EXPECT_EQ(1, log_.Count("there is no Samba configuration " + conf_)) << "said once";
  kova::host::AddShare({"homes", Folder("homes")});
  const string text =
      "[global]\nspotlight = yes\n[homes]\n x = 1\ninclude = " + (dir_ / "more") + "\n[print$]\n y = 2\n";
  WriteFile(conf_, text);
  WriteFile(dir_ / "more", "[Music]\n path = /m\n");
  EXPECT_EQ(0, KOVASMBIsEnableSpotlight());
  EXPECT_LT(KOVASMBSetSpotlight(1), 0);
  EXPECT_EQ(KOVA_ERR_NOT_SUPPORTED, KLIBCErrGet());
  EXPECT_EQ(text, ReadFile(conf_));
  EXPECT_EQ(1, log_.Count("the section of share \"music\" is in " + (dir_ / "more")));
}

TEST_F(HostSambaTest, TheFileKeepsItsPlaceItsModeAndItsOwner) {
  const string real = dir_ / "real.conf", before = "[photo]\n[music]\n[other]\n";
  WriteFile(real, before);
  std::filesystem::create_directories(TestRoot() + "/etc/samba");
  std::filesystem::create_symlink(real, conf_);
  std::filesystem::permissions(real, std::filesystem::perms(0640));
  const bool root = geteuid() == 0;
  const uid_t owner = root ? 65534 : geteuid();
  const gid_t group = root ? 65533 : getegid();
  ASSERT_EQ(0, chown(real.c_str(), owner, group));
  Configure("\"smbcontrol\": \"" + Program("smbcontrol", "echo \"$@\" >> " + (dir_ / "told")) + "\"");
  ASSERT_EQ(0, KOVASMBSetSpotlight(1));
  ASSERT_EQ(0, KOVASMBSetSpotlight(1)) << "nothing to change";
  EXPECT_EQ("[photo]\n   spotlight = yes\n[music]\n   spotlight = yes\n[other]\n", ReadFile(real));
  EXPECT_EQ("-s " + real + " samba-dcerpcd shutdown\n", ReadFile(dir_ / "told")) << "once, after the change";
  EXPECT_TRUE(std::filesystem::is_symlink(conf_));
  struct stat info = {};
  ASSERT_EQ(0, stat(real.c_str(), &info));
  EXPECT_EQ(0640U, info.st_mode & 07777);
  EXPECT_EQ(owner, info.st_uid);
  EXPECT_EQ(group, info.st_gid);
}

TEST_F(HostSambaTest, WhatCannotBeWrittenStaysAsItIs) {
  const string disk = Folder("disk"), before = "[photo]\n#" + string(30000, 'x') + "\n";
  Configure("\"config\": \"" + disk + "/smb.conf\"");
  const bool ran = InChild(true, [&] {
    ASSERT_EQ(0, mount("tmpfs", disk.c_str(), "tmpfs", 0, "size=40k"));
    WriteFile(disk + "/smb.conf", before);
    EXPECT_LT(KOVASMBSetSpotlight(1), 0);
    EXPECT_EQ(KOVA_ERR_OUT_OF_SPACE, KLIBCErrGet());
    EXPECT_EQ(before, ReadFile(disk + "/smb.conf"));
    EXPECT_EQ(1, std::distance(std::filesystem::directory_iterator(disk), {})) << "something is left behind";
    ASSERT_EQ(0, mount(nullptr, disk.c_str(), nullptr, MS_REMOUNT | MS_RDONLY, "size=400k"));
    EXPECT_LT(KOVASMBSetSpotlight(1), 0);
    EXPECT_EQ(KOVA_ERR_SYSTEM, KLIBCErrGet());
    EXPECT_EQ(before, ReadFile(disk + "/smb.conf"));
  });
  if (!ran) GTEST_SKIP() << "this system does not let the test mount";
}

TEST_F(HostSambaTest, WhatTestparmTellsBecomesShares) {
  const string video = Folder("video");
  const auto section = [](const string& name, const string& path, const string& more = "") {
    return "\n\n[" + name + "]\n" + more + "\tpath = " + path + "\n";
  };
  std::vector<string> problems;
  const auto shares = kova::host::ParseTestparm(
      "# Global parameters\n[global]\n\tworkgroup = WG\n\thide unreadable = Yes\n\trecycle:repository = .bin/%U\n" +
          section("homes", "/h", "\tbrowseable = No\n") + section("ViDeo", video, "\tvfs objects = catia recycle\n") +
          section("data", "/gone/data",
                  "\thide unreadable = No\n\tread only = No\n\tvfs objects = recycle:x catia\n"
                  "\trecycle : repository = #recycle\n") +
          section("me", "/srv/%U/me") + section("lp", "/tmp", "\tprintable = Yes\n") +
          section("off", "/srv/off", "\tavailable = No\n") + section("Data Bank", "\"/gone/Data Bank/\"") +
          section("IPC$", "/tmp") + section("own", "/srv/own", "\tvfs objects = recycle\n\trecycle:repository = %U\n"),
      problems);
  string told;
  for (const auto& share : shares) {
    told += share.name + " " + share.path + " " + share.recycle + (share.hide_unreadable ? " h" : "") + " " +
            std::to_string(share.ftp_privilege) + "\n";
  }
  EXPECT_EQ(
      "video " + video + " .bin h 1\ndata /gone/data #recycle 2\nData Bank /gone/Data Bank  h 1\nown /srv/own  h 1\n",
      told);
  ASSERT_EQ(2U, problems.size());
  EXPECT_NE(string::npos, problems[0].find("Samba's share \"me\" is left out: its path /srv/%U/me differs"));
  EXPECT_NE(string::npos, problems[1].find("Samba's share \"own\": its recycle bin %U differs"));
}

TEST_F(HostSambaTest, ShareRulesAreReadOrCloseTheShare) {
  const struct {
    const char* lines;
    const char* users;  ///< the valid ones, a bar, and the invalid ones; or why the share is closed
    const char* foreign_rights = "";
  } rows[] = {
      {"", "|nobody"},
      {"guest ok = yes", "|"},
      {"force user = root\nadmin users = eve\nforce group = +wheel\nguest only = yes\nguest ok = yes", "|"},
      {"valid users = ann, bob @staff\nguest ok = yes", "ann bob @staff|"},
      {"valid users = \"@CORP\\domain users\" +\"two words\" CORP\\ann",
       "@CORP\\domain users +two words CORP\\ann|nobody"},
      {"invalid users = root @wheel +adm", "|root @wheel +adm nobody"},
      {"valid users = ann\ninvalid users = %S", "rule \"invalid users\" has a macro"},
      {"valid users = %U ann", "rule \"valid users\" has a macro"},
      {"valid users = &net", "names a netgroup (&net)"},
      {"invalid users = ann +&net", "names a netgroup (+&net)"},
      {"valid users = \"ann bob", "quotation marks without an end"},
      {"valid users = ann @", "has an empty name"},
      {"valid users = S-1-5-21-1", "names a security id"},
      {"hosts allow = 10.0.0.0/8", "\"hosts allow\" goes by the host"},
      {"hosts deny = all", "\"hosts deny\" goes by the host"},
      {"vfs objects = catia acl_xattr:x", "module acl_xattr may refuse more"},
      {"vfs objects = acl_tdb\nacl_tdb:ignore system acls = yes", "module acl_tdb", "module acl_tdb keeps rights"},
      {"vfs objects = nfs4acl_xattr", "|nobody", "module nfs4acl_xattr keeps rights"},
  };
  for (const auto& row : rows) {
    const SmbConf conf(string("[global]\n[s]\n") + row.lines + "\n[t]\nvalid users = other\n");
    const kova::host::ShareUsers users = kova::host::SambaUsers(conf, "s");
    string told = users.closed;
    if (told.empty()) {
      for (const string& name : users.valid) told += (told.empty() ? "" : " ") + name;
      told += "|";
      for (const string& name : users.invalid) told += (told.back() == '|' ? "" : " ") + name;
      EXPECT_EQ(row.users, told) << row.lines;
    }
    EXPECT_NE(string::npos, told.find(row.users)) << row.lines << ": " << told;
    EXPECT_TRUE(users.closed.empty() || (users.valid.empty() && users.invalid.empty())) << row.lines;
    const string problem = kova::host::SambaRightsProblem(conf, "s");
    EXPECT_NE(string::npos, problem.find(row.foreign_rights)) << problem;
    EXPECT_EQ(problem.empty(), *row.foreign_rights == '\0') << problem;
  }
  const SmbConf everywhere("[global]\nhosts allow = 10.\nguest account = visitor\n[s]\npath = /s\n");
  EXPECT_FALSE(kova::host::SambaUsers(everywhere, "s").closed.empty());
}

TEST(ShareNamesTest, PatternsAreReadOrCloseTheShare) {
  const struct {
    const char *lines, *told;  ///< vetoed; hidden; or why it is closed
  } rows[] = {{"", ";"},
              {"veto files = /*.tmp/two  blanks/", "*.tmp|two  blanks|;"},
              {"hide files = one//?x\ncase sensitive = yes", ";one|?x|case"},
              {"veto files = /100%/", "\"veto files\" has a macro"},
              {"hide files = /a/\nhide files : ann = /b/", "\"hide files\" differs from user to user"}};
  for (const auto& row : rows) {
    const SmbConf conf(string("[global]\n[s]\n") + row.lines + "\n[t]\nveto files = /%U/\n");
    const kova::host::ShareNames names = kova::host::SambaNames(conf, "s");
    string told;
    for (const string& pattern : names.veto) told += pattern + "|";
    told += ";";
    for (const string& pattern : names.hide) told += pattern + "|";
    told += names.case_counts ? "case" : "";
    EXPECT_NE(string::npos, (names.closed.empty() ? told : names.closed).find(row.told)) << row.lines << ": " << told;
  }
}

TEST_F(HostSambaTest, TheSearchEngineIsToldOfSambasRulesAndOfTheTables) {
  const string testparm = Program("testparm", "exec cat " + conf_);
  WriteFile(conf_, "[video]\n valid users = ann\n path = " + Folder("video") + "\n");
  Configure("\"shares\": true, \"testparm\": \"" + testparm + "\"");
  kova::host::ShareForSearch found;
  ASSERT_TRUE(kova::host::FindShareForSearch("video", found));
  EXPECT_EQ(dir_ / "video", found.root);
  EXPECT_EQ("", found.refused);
  EXPECT_EQ("ann", found.rules["valid_users"][0].asString());
  const string table = TestRoot() + "/etc/kova/shares.json";
  const auto write = [&](const string& members) {
    WriteFile(table, R"([{"name": "music", "path": ")" + Folder("music") + "\", " + members + "}]");
    return kova::host::FindShareForSearch("music", found);
  };
  ASSERT_TRUE(write(R"("valid_users": ["ann", "@staff"], "veto_files": "/.x*/")"));
  EXPECT_EQ("+staff", found.rules["valid_users"][1].asString()) << "no netgroup: only Samba has those";
  EXPECT_EQ(".x*", found.rules["veto_files"][0].asString());
  const string too_many = "\"hide_files\": \"/" + [] {
    string list;
    for (int i = 0; i < 1001; ++i) list += "a/";
    return list;
  }() + "\"";
  for (const string& damaged : {string(R"("valid_users": "ann")"), string(R"("invalid_users": ["&net"])"),
                                string(R"("veto_files": ".x")"), too_many}) {
    EXPECT_FALSE(write(damaged)) << damaged;
  }
  std::filesystem::remove(table);
}

TEST(FileSystemRightsTest, OnlyRightsThatTheKernelChecksCount) {
  const struct {
    int type;
    const char *mounted_type, *options;
    bool refused;
  } rows[] = {{KOVA_FS_EXT, "ext4", "rw", false},
              {KOVA_FS_UNKNOWN, "bcachefs", "rw", false},
              {KOVA_FS_FAT, "vfat", "rw,uid=5", true},
              {KOVA_FS_NTFS, "ntfs3", "rw", true},
              {KOVA_FS_NTFS, "fuseblk", "rw,allow_other", true},
              {KOVA_FS_NTFS, "fuseblk", "rw,default_permissions,allow_other", false},
              {KOVA_FS_FUSE, "fuse.bindfs", "rw,no_default_permissions", true},
              {KOVA_FS_FUSE, "virtiofs", "rw", false},
              {KOVA_FS_FUSE_REMOTE, "fuse.sshfs", "rw,default_permissions", true},
              {KOVA_FS_CIFS, "cifs", "rw", true},
              {KOVA_FS_NFS, "nfs4", "rw", true},
              {KOVA_FS_UNKNOWN, "9p", "rw", true}};
  for (const auto& row : rows) {
    const string problem = kova::host::FileSystemRightsProblem(row.type, row.mounted_type, row.options);
    EXPECT_EQ(row.refused, !problem.empty()) << row.mounted_type << " " << row.options;
  }
}

TEST_F(HostSambaTest, SharesFollowTheFilesThatTheyComeFrom) {
  const string runs = dir_ / "runs", more = dir_ / "more";
  const string testparm = Program("testparm", "echo \"$@\" >> " + runs + "\nexec cat $3");
  const auto shares = [&](const string& names) {
    string text = "[global]\n include = " + more + "\n";
    for (const char name : names) {
      text += string("[") + name + "]\n path = " + Folder(string(1, name)) + "\n";
    }
    return text;
  };
  const auto look_ups = [] {
    string found;
    for (const char* name : {"a", "b", "photo"}) found += IsShare(name) ? name : "-";
    return found;
  };
  const auto count_runs = [&] {
    const string lines = ReadFile(runs);
    return std::count(lines.begin(), lines.end(), '\n');
  };
  WriteFile(conf_, shares("a"));
  EXPECT_EQ("--photo", look_ups()) << "nobody asked for them";
  Configure("\"shares\": true, \"testparm\": \"" + testparm + "\"");
  EXPECT_EQ("a-photo", look_ups());
  EXPECT_EQ("-s --suppress-prompt " + conf_ + "\n", ReadFile(runs)) << "one run for all look-ups";
  WriteFile(conf_, shares("ab"));
  EXPECT_EQ("a-photo", look_ups()) << "within a second of the last look";
  kova::host::ExpectSambaChange();
  EXPECT_EQ("abphoto", look_ups());
  kova::host::ExpectSambaChange();
  EXPECT_EQ("abphoto", look_ups());
  EXPECT_EQ(2, count_runs()) << "nothing has changed";
  WriteFile(more, "# is new\n");
  kova::host::ExpectSambaChange();
  EXPECT_EQ("abphoto", look_ups());
  EXPECT_EQ(3, count_runs()) << "an included file has changed";

  for (const char* script : {"exit 1", "exec yes without end"}) {
    Program("testparm", script);
    WriteFile(conf_, shares("b") + "#" + script);
    kova::host::ExpectSambaChange();
    EXPECT_EQ("abphoto", look_ups()) << "the last good answer";
  }
  EXPECT_EQ(1, log_.Count("Samba's shares cannot be read anew"));
  EXPECT_THROW(kova::host::RemoveShare("a"), kova::host::ShareTableError);
  Configure("\"shares\": false");
  EXPECT_EQ("--photo", look_ups());
}

TEST_F(HostSambaTest, AShareOfTheTableHidesSambas) {
  const string testparm = Program("testparm", "exec cat " + conf_);
  WriteFile(conf_, "[photo]\n path = " + Folder("v2/photo") + "\n[video]\n path = " + Folder("video") + "\n");
  Configure("\"shares\": true, \"testparm\": \"" + testparm + "\"");
  char name[256], path[4096];
  EXPECT_LT(KOVAShareNamePathGet((dir_ / "v2/photo/x").c_str(), name, sizeof(name), path, sizeof(path)), 0);
  ASSERT_GE(KOVAShareNamePathGet((dir_ / "video/x").c_str(), name, sizeof(name), path, sizeof(path)), 0);
  EXPECT_EQ("/video/x", string(path));
  const auto shares = kova::host::ListShares();
  ASSERT_EQ(3U, shares.size());
  EXPECT_EQ(dir_ / "photo", shares[1].path);
  EXPECT_TRUE(!shares[1].from_samba && shares[2].from_samba);
  EXPECT_EQ(1, log_.Count("share \"photo\" is at " + (dir_ / "photo") + " by "));
}

TEST_F(HostSambaTest, TheRealTestparmIsUnderstood) {
  if (access("/usr/bin/testparm", X_OK) != 0) GTEST_SKIP() << "samba-common-bin is not installed";
  WriteFile(conf_, "[global]\n vfs objects = catia recycle\n[video]\n path = " + Folder("video") +
                       "\n writable = yes\n[Data \\\n  Bank]\n copy = video\n hide unreadable = true\n path = " +
                       Folder("Data Bank") + "/\n recycle:repository = .Bin\n");
  Configure("\"shares\": true");
  const auto shares = kova::host::ListShares();
  ASSERT_EQ(4U, shares.size());
  EXPECT_EQ(dir_ / "Data Bank", shares[0].path);
  EXPECT_EQ(".Bin", shares[0].recycle);
  EXPECT_TRUE(shares[0].hide_unreadable);
  EXPECT_EQ("video", shares[3].name);
  EXPECT_EQ(".recycle", shares[3].recycle);
  EXPECT_EQ(2U, shares[3].ftp_privilege);
  EXPECT_EQ(1, KOVAShareIsShareRecycle((dir_ / "Data Bank/.Bin/x").c_str()));
}

}  // namespace
}  // namespace ferrox::test
