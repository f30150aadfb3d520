#include "fileindex/folder.h"

#include "tests/support/library_test.h"

namespace ferrox::fileindex {

namespace {

using test::FailureOf;
using test::Parse;

class FolderTest : public test::LibraryTest {};

constexpr char kStored[] = R"({"audio":true,"document":false,"name":"n","path":"/photo/a","paused":false,"photo":true,)"
                           R"("privileged":false,"video":false,"volume_to_be_clean":""})";

}  // namespace

TEST_F(FolderTest, StoredFormsAreReadAndWritten) {
  const std::string full = R"({"audio":true,"document":false,"name":"n","path":"/photo/a","paused":true,"photo":true,)"
                           R"("privileged":true,"video":false,"volume_to_be_clean":"/volume2"})";
  EXPECT_EQ(Folder(Parse(full)).GetData(), Parse(full));
  const std::string least = R"({"audio":true,"document":false,"name":"n","path":"/photo/a","photo":true,"video":false)";
  EXPECT_EQ(Folder(Parse(least + "}")).GetData(), Parse(kStored));
  EXPECT_EQ(Folder(Parse(least + R"(,"paused":"x","privileged":[],"volume_to_be_clean":{}})")).GetData(),
            Parse(kStored));
  EXPECT_EQ(Folder(Parse(full)).GetIndexCfg(), Parse(R"({"audio":true,"document":false,"photo":true,"video":false})"));
}

TEST_F(FolderTest, TheFirstUnusableMemberIsNamed) {
  const std::string tail = ", data=";
  Json::Value data = Parse("{}");
  for (const char* key : {"path", "name", "document", "audio", "video", "photo"}) {
    EXPECT_EQ(FailureOf([&data] { Folder{data}; }).find(std::string("120 Missing property: ") + key + tail), 0U) << key;
    data[key] = Json::Value(Json::arrayValue);
    EXPECT_EQ(FailureOf([&data] { Folder{data}; }).find("120 Not a string" + tail), 0U) << key;
    data[key] = true;
  }
  EXPECT_EQ(FailureOf([] { Folder{Parse("[]")}; }).find("120 Not an object" + tail), 0U);
}

TEST_F(FolderTest, FollowsItsShare) {
  platform_.shares["photo"].path = "/volume1/photo";
  platform_.shares["new"].path = "/volume2/new";
  Folder folder("/photo/a/photo", "n", true, true, true, true, false, false);
  EXPECT_EQ(folder.GetShare(), "photo");
  EXPECT_EQ(folder.GetFullPath(), "/volume1/photo/a/photo");
  folder.SetShare("new");
  EXPECT_EQ(folder.GetPath(), "/new/a/photo");
  EXPECT_EQ(folder.GetShare(), "new");
  EXPECT_EQ(folder.GetFullPath(), "/volume1/photo/a/photo") << "deliberate: as it was asked for before";
  folder.SetPath("/new/b");
  EXPECT_EQ(folder.GetFullPath(), "/volume2/new/b");
  folder.SetPath("gone");
  EXPECT_EQ(FailureOf([&folder] { (void)folder.GetShare(); }), "120 ");
  EXPECT_EQ(FailureOf([&folder] { (void)folder.GetFullPath(); }), "120 ");
  EXPECT_EQ(FailureOf([&folder] { folder.SetShare("new"); }), "120 ");
  folder.SetPath("/gone");
  EXPECT_EQ(FailureOf([&folder] { (void)folder.GetFullPath(); }), "800 gone");
}

}  // namespace ferrox::fileindex
