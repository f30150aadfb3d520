// Catches records of the kernel whose lengths would lead out of the buffer.
#include "services/kovanotifyd/fan_group.h"

#include <cstdint>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace ferrox::notifyd {
namespace {

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
