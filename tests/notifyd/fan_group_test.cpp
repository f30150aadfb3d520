#include "services/kovanotifyd/fan_group.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "tests/support/temp_dir.h"

namespace ferrox::notifyd {
namespace {

using test::TempDir;
using test::WriteFile;

class FanGroupTest : public testing::Test {
 protected:
  void SetUp() override {
    const std::string reason = group_.Open();
    if (!reason.empty()) GTEST_SKIP() << reason;
    const int error = group_.Mark(dir_.Path(), FanGroup::Scope::kFolder, FAN_CREATE | FAN_RENAME | FAN_ONDIR);
    if (error != 0) GTEST_SKIP() << FanGroup::Reason(error, FanGroup::Scope::kFolder);
  }

  UniqueFd OpenFolder(const std::string& path) { return UniqueFd(open(path.c_str(), O_PATH | O_CLOEXEC)); }

  TempDir dir_;
  FanGroup group_;
  FanBatch batch_;
};

TEST_F(FanGroupTest, RecordsCarryTheKeysOfFolders) {
  ASSERT_EQ(mkdir((dir_ / "a").c_str(), 0755), 0);
  ASSERT_EQ(rename((dir_ / "a").c_str(), (dir_ / "b").c_str()), 0);
  ASSERT_EQ(group_.Read(batch_), 0);
  EXPECT_EQ(group_.Read(batch_), EAGAIN) << "and what was read is gone from the batch";
  ASSERT_EQ(mkdir((dir_ / "c").c_str(), 0755), 0);
  ASSERT_EQ(rename((dir_ / "c").c_str(), (dir_ / "d").c_str()), 0);
  ASSERT_EQ(group_.Read(batch_), 0);
  ASSERT_EQ(batch_.records.size(), 2U);
  const UniqueFd top = OpenFolder(dir_.Path());
  const UniqueFd below = OpenFolder(dir_ / "d");
  const HandleKey key = group_.KeyOf(top.Get());
  const FanRecord& renamed = batch_.records[1];
  EXPECT_EQ(renamed.folder, key);
  EXPECT_EQ(renamed.name, "c");
  EXPECT_EQ(renamed.new_folder, key);
  EXPECT_EQ(renamed.new_name, "d");
  EXPECT_EQ(renamed.target, group_.KeyOf(below.Get()));
  EXPECT_EQ(renamed.target, group_.KeyOf(below.Get(), key));
  EXPECT_EQ(batch_.records[0].target, renamed.target);
  EXPECT_TRUE(renamed.IsFolder());
  EXPECT_TRUE(FanGroup::IsSameFileSystem(key, renamed.target));
}

TEST_F(FanGroupTest, AKeyOpensItsFolderWhereverItIs) {
  ASSERT_EQ(mkdir((dir_ / "a").c_str(), 0755), 0);
  const HandleKey key = group_.KeyOf(OpenFolder(dir_ / "a").Get());
  ASSERT_EQ(rename((dir_ / "a").c_str(), (dir_ / "b").c_str()), 0);
  const UniqueFd mount(open(dir_.Path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  const UniqueFd opened = FanGroup::OpenKey(key, mount.Get(), O_PATH);
  if (!opened.Valid() && (errno == EPERM || errno == EOPNOTSUPP)) GTEST_SKIP() << strerror(errno);
  EXPECT_EQ(group_.KeyOf(opened.Get()), key);
  ASSERT_EQ(rmdir((dir_ / "b").c_str()), 0);
  EXPECT_FALSE(FanGroup::OpenKey("", mount.Get(), O_PATH).Valid());
}

/// The bytes of one record as the kernel writes them: a folder's handle of 8 bytes and a name.
std::string RecordBytes(const std::string& name) {
  std::string info(4 + 8 + 8, '\0');
  info[0] = FAN_EVENT_INFO_TYPE_DFID_NAME;
  info[12] = 8;
  info[16] = 1;
  info += "HANDLE01" + name + '\0';
  info[2] = static_cast<char>(info.size());
  fanotify_event_metadata event = {};
  event.event_len = static_cast<uint32_t>(sizeof event + info.size());
  event.vers = FANOTIFY_METADATA_VERSION;
  event.metadata_len = sizeof event;
  event.mask = FAN_CREATE;
  return std::string(reinterpret_cast<const char*>(&event), sizeof event) + info;
}

TEST(FanRecordTest, BrokenLengthsAreNotFollowed) {
  const std::string whole = RecordBytes("name") + RecordBytes("other");
  for (size_t at = 0; at < whole.size(); ++at) {
    for (const int value : {0, 1, 0x7F, 0xFF}) {
      SCOPED_TRACE(std::to_string(at) + "=" + std::to_string(value));
      std::string broken = whole;
      broken[at] = static_cast<char>(value);
      // Exactly as long as it is, so that a sanitizer sees each byte behind it.
      const std::vector<char> bytes(broken.begin(), broken.end());
      std::vector<FanRecord> records;
      FanGroup().Parse(bytes.data(), bytes.size(), records);
      EXPECT_LE(records.size(), 2U);
      for (const FanRecord& record : records) EXPECT_LE(record.name.size(), bytes.size());
    }
  }
  std::vector<FanRecord> records;
  FanGroup().Parse(whole.data(), whole.size(), records);
  ASSERT_EQ(records.size(), 2U);
  EXPECT_EQ(records[0].name, "name");
  EXPECT_EQ(records[1].name, "other");
  EXPECT_EQ(records[0].folder, records[1].folder);
}

}  // namespace
}  // namespace ferrox::notifyd
