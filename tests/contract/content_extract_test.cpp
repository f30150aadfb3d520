// What ParseFile makes of files on the host, with the extraction daemon that it starts itself.

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <atomic>
#include <cstring>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>
#include <json/value.h>

#include <kova/content_extract.h>
#include <kova/service.h>

#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

using std::string;

constexpr char kService[] = "kovacontentextractd";

class ContentExtractTest : public testing::Test {
 protected:
  static void TearDownTestSuite() { EXPECT_EQ(0, KLIBServiceStop(kService, 1)); }

  Json::Value Parse(const string& name, bool need_meta = true) {
    Json::Value config, document;
    config["need_meta"] = need_meta;
    KOVA::CONTENT_EXTRACT::ParseFile(dir_ / name, config, document);
    return document;
  }
  Json::Value ParseBytes(const string& name, const string& bytes) {
    WriteFile(dir_ / name, bytes);
    return Parse(name);
  }

  TempDir dir_;
};

TEST_F(ContentExtractTest, ADaemonIsStartedOnceForAllThatNeedIt) {
  ASSERT_EQ(0, KLIBServiceStop(kService, 1));
  WriteFile(dir_ / "by_name.txt", "x");
  (void)Parse("by_name.txt", false);
  (void)ParseBytes("by_type.ttf", "no font");
  EXPECT_EQ(0, KLIBServiceIsRunning(kService)) << "no content was wanted, or nobody could read it";
  for (const char* name : {"a", "b", "c", "d"}) WriteFile(dir_ / name, string(1000, *name));
  std::atomic<int> wrong = 0;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&, t] {
      for (int i = 0; i < 100; ++i) {
        const string name(1, "abcd"[(t + i) % 4]);
        if (Parse(name)["KOVAMDTextContent"].asString() != string(1000, name[0])) ++wrong;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(0, wrong);
  EXPECT_EQ(1, KLIBServiceIsRunning(kService));
}

TEST_F(ContentExtractTest, AKeptConnectionIsMadeAnewWhenItHasEnded) {
  for (const char letter : {'a', 'b', 'c'}) {
    const string text(100000, letter);
    EXPECT_EQ(text, ParseBytes("long.txt", text)["KOVAMDTextContent"].asString());
    EXPECT_EQ("short", ParseBytes("short.txt", "short")["KOVAMDTextContent"].asString()) << "not the rest of the last";
    ASSERT_EQ(0, KLIBServiceStop(kService, 1));
  }
}

TEST_F(ContentExtractTest, WithoutADaemonNothingIsSaidOfTheFile) {
  ASSERT_EQ(0, KLIBServiceStop(kService, 1));
  const string socket = TestRoot() + "/var/run/kovacontentextractd.sock";
  std::filesystem::create_directories(socket + "/occupied");  // nothing can be served there
  EXPECT_THROW((void)ParseBytes("a.txt", "x"), std::runtime_error);
  EXPECT_NE(string::npos, KOVA::CONTENT_EXTRACT::ExtractionProblem().find(socket))
      << KOVA::CONTENT_EXTRACT::ExtractionProblem();
  EXPECT_THROW((void)Parse("missing.txt"), std::runtime_error);
  EXPECT_EQ("", KOVA::CONTENT_EXTRACT::ExtractionProblem()) << "the file was the reason";
  std::filesystem::remove_all(socket);
  ASSERT_EQ(0, KLIBServiceStart(kService, 1));
  EXPECT_EQ("x", Parse("a.txt")["KOVAMDTextContent"].asString());
}

TEST_F(ContentExtractTest, TheContentTellsWhatTheNameDoesNot) {
  const struct {
    const char* name;
    string bytes;
    const char* type;
    bool has_text;
  } rows[] = {
      {"page.txt", "<html><p>x</html>", "text/plain", true},
      {"no_extension", "<html><p>x</html>", "text/html", true},
      {"really_a_page.doc", "<html><p>x</html>", "text/html", true},
      {"really_text.doc", "plain words", "text/plain", true},
      {"really_text.pdf", "plain words", "text/plain", true},
      {"package.txt", string("7z\xbc\xaf\x27\x1c\0\4", 8), "application/x-7z-compressed", false},
      {"letter.docx", "{\\rtf1 hello}", "application/rtf", true},
      {"song.txt", "ID3 is a tag", "text/plain", true},
      {"no_extension_either", "GIF89a", "image/gif", false},
      {"unknown", string("wOFF\0\1\0\0", 8), "font/woff", false},
  };
  for (const auto& row : rows) {
    const Json::Value document = ParseBytes(row.name, row.bytes);
    EXPECT_EQ(row.type, document["KOVAMDContentType"].asString()) << row.name;
    EXPECT_EQ(row.has_text, document.isMember("KOVAMDTextContent")) << row.name;
    EXPECT_TRUE(document["_KOVAExtractVersion"].isInt()) << row.name;
  }
}

TEST_F(ContentExtractTest, SpecialAndUnreadableFilesAreNamesWithAReason) {
  ASSERT_EQ(0, mkfifo((dir_ / "fifo.txt").c_str(), 0600));
  ASSERT_EQ(0, symlink("/etc/passwd", (dir_ / "link.txt").c_str()));
  for (const char* name : {"fifo.txt", "link.txt"}) {
    const Json::Value document = Parse(name);
    EXPECT_EQ("not a regular file", document["_KOVAExtractError"].asString()) << name;
    EXPECT_EQ("txt", document["KOVAMDExtension"].asString());
    EXPECT_TRUE(document["_KOVANeedMeta"].asBool());
    EXPECT_EQ("0000", document["_KOVAAccess"].asString().substr(document["_KOVAAccess"].asString().rfind(':') + 1));
    const Json::Value by_name = Parse(name, false);
    EXPECT_FALSE(by_name.isMember("_KOVAExtractError") || by_name.isMember("_KOVANeedMeta")) << "no content was wanted";
  }
  EXPECT_THROW((void)Parse("missing.txt"), std::runtime_error);
  std::filesystem::create_directory(dir_ / "folder.d");
  const Json::Value folder = Parse("folder.d");
  EXPECT_TRUE(folder["KOVAMDIsDir"].asBool());
  EXPECT_FALSE(folder.isMember("_KOVAExtractError") || folder.isMember("_KOVANeedMeta"));
  WriteFile(dir_ / "secret.txt", "x");
  ASSERT_EQ(0, chmod((dir_ / "secret.txt").c_str(), 0));
  const Json::Value secret = Parse("secret.txt");
  EXPECT_EQ(geteuid() == 0 ? "" : "Permission denied", secret["_KOVAExtractError"].asString());
}

TEST_F(ContentExtractTest, FactsHaveTheTypesOfTheSchema) {
  const string name = "A\n\"\xff.Tar.GZ";
  WriteFile(dir_ / name, string(70000, 'x'));
  struct stat info = {};
  ASSERT_EQ(0, stat((dir_ / name).c_str(), &info));
  const Json::Value document = Parse(name, false);
  EXPECT_EQ(dir_ / name, document["KOVAMDPath"].asString());
  EXPECT_EQ(dir_.Path(), document["KOVAMDParent"].asString());
  EXPECT_EQ(name, document["KOVAMDFSName"].asString());
  EXPECT_EQ(name, document["KOVAMDDisplayName"].asString());
  EXPECT_EQ("gz", document["KOVAMDExtension"].asString());
  EXPECT_EQ("gz", document["KOVAMDKind"].asString());
  EXPECT_TRUE(document["KOVAMDIsDir"].isBool());
  EXPECT_EQ(70000, document["KOVAMDFSSize"].asInt64());
  EXPECT_EQ(info.st_mtime, document["KOVAMDFSContentChangeDate"].asInt64());
  EXPECT_EQ(std::to_string(info.st_uid), document["KOVAMDOwnerUserID"].asString());
  EXPECT_EQ("application/gzip", document["KOVAMDContentType"].asString());
}

TEST_F(ContentExtractTest, TheStampFollowsTheFile) {
  WriteFile(dir_ / "a", "1");
  const string first = Parse("a", false)["_KOVAStamp"].asString();
  EXPECT_EQ(first, Parse("a", true)["_KOVAStamp"].asString());
  struct stat status = {};
  ASSERT_EQ(lstat((dir_ / "a").c_str(), &status), 0);
  EXPECT_EQ(first, KOVA::CONTENT_EXTRACT::Stamp(status));
  WriteFile(dir_ / "a", "22");
  const string longer = Parse("a", false)["_KOVAStamp"].asString();
  EXPECT_NE(first, longer);
  EXPECT_TRUE(KOVA::CONTENT_EXTRACT::SameFile(first, longer));
  EXPECT_FALSE(KOVA::CONTENT_EXTRACT::SameContent(first, longer));
  std::filesystem::permissions(dir_ / "a", std::filesystem::perms::owner_all);
  const string attributes = Parse("a", false)["_KOVAStamp"].asString();
  EXPECT_TRUE(KOVA::CONTENT_EXTRACT::SameContent(longer, attributes));
  WriteFile(dir_ / "b", "33");
  std::filesystem::rename(dir_ / "b", dir_ / "a");
  EXPECT_NE(attributes, Parse("a", false)["_KOVAStamp"].asString());
  EXPECT_FALSE(KOVA::CONTENT_EXTRACT::SameFile(attributes, Parse("a", false)["_KOVAStamp"].asString()));
}

TEST_F(ContentExtractTest, RightsAreThoseOfModeAndAcl) {
  WriteFile(dir_ / "a", "1");
  const string ids = std::to_string(geteuid()) + ":" + std::to_string(getegid());
  const auto access = [this] { return Parse("a", false)["_KOVAAccess"].asString(); };
  ASSERT_EQ(0, chmod((dir_ / "a").c_str(), 04604));
  EXPECT_EQ(ids + ":4604", access());
  // Version 2; owner rw, 5001 r, 4000000000 none, group r, 200 rw, mask r, others none.
  const string none("\xff\xff\xff\xff", 4);
  const string acl = string("\2\0\0\0\1\0\6\0", 8) + none + string("\2\0\4\0\x89\x13\0\0\2\0\0\0\0\x28\x6b\xee", 16) +
                     string("\4\0\4\0", 4) + none + string("\x8\0\6\0\xc8\0\0\0\x10\0\4\0", 12) + none +
                     string("\x20\0\0\0", 4) + none;
  if (setxattr((dir_ / "a").c_str(), "system.posix_acl_access", acl.data(), acl.size(), 0) != 0) {
    GTEST_SKIP() << "no ACLs here: " << strerror(errno);
  }
  EXPECT_EQ(ids + ":4640:u5001=4,u4000000000=0,g=4,g200=6", access());
  ASSERT_EQ(0, removexattr((dir_ / "a").c_str(), "system.posix_acl_access"));
  EXPECT_EQ(ids + ":4640", access()) << "the mask has become the group's bits";
}

TEST_F(ContentExtractTest, AFileWhoseRightsDoNotStayTheSameIsItsNameAlone) {
  WriteFile(dir_ / "a.txt", "word");
  std::atomic<bool> stop = false;
  std::thread changes([&] {
    for (unsigned mode = 0; !stop; ++mode) (void)chmod((dir_ / "a.txt").c_str(), 0400 | mode % 0400);
  });
  Json::Value unsettled = Parse("a.txt");  // where the thread gets no processor, nothing changes
  for (int i = 0; i < 2000 && unsettled.isMember("KOVAMDTextContent"); ++i) unsettled = Parse("a.txt");
  stop = true;
  changes.join();
  EXPECT_FALSE(unsettled.isMember("KOVAMDTextContent"));
  EXPECT_EQ("its rights kept changing while it was read", unsettled["_KOVAExtractError"].asString());
  EXPECT_EQ("text/plain", unsettled["KOVAMDContentType"].asString());
  const Json::Value settled = Parse("a.txt");
  EXPECT_EQ("word", settled["KOVAMDTextContent"].asString());
  EXPECT_FALSE(
      KOVA::CONTENT_EXTRACT::SameContent(settled["_KOVAStamp"].asString(), unsettled["_KOVAStamp"].asString()));
}

}  // namespace
}  // namespace ferrox::test
