// libfileindex.so as programs use it: its platform calls are resolved by the host's platform at link time.

#include <filesystem>

#include <gtest/gtest.h>

#include "common/file_util.h"
#include "fileindex/util.h"
#include "platform/host/share_table.h"
#include "sdk/credentials.h"
#include "sdk/share.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

TEST(LibraryOnHostTest, ASharesPathsGoThereAndBack) {
  const TempDir dir;
  const std::string photo = dir / "photo";
  std::filesystem::create_directories(photo + "/trip");
  WriteFile(photo + "/trip/a.jpg", "x");
  std::filesystem::create_directory_symlink(photo + "/trip", photo + "/link");
  kova::host::AddShare({"photo", photo});
  EXPECT_EQ(std::vector<std::string>{"photo"}, sdk::SDKShare::Enum());
  const sdk::SDKShare share("photo");
  EXPECT_EQ(photo, share.GetPath());
  EXPECT_TRUE(share.CanBeIndexed());
  EXPECT_TRUE(std::filesystem::is_directory(Dirname(share.GetQueuePath())));
  EXPECT_EQ(photo + "/trip/a.jpg", fileindex::GetFullPath("/photo/trip/a.jpg"));
  std::string name, share_path;
  fileindex::GetShareNamePathByFullPath(name, share_path, photo + "/trip/a.jpg");
  EXPECT_EQ("/photo/trip/a.jpg", share_path);
  EXPECT_TRUE(fileindex::CanPathBeIndexed("/photo"));
  EXPECT_TRUE(fileindex::CanPathBeIndexed("/photo/trip/a.jpg"));
  EXPECT_FALSE(fileindex::CanPathBeIndexed("/photo/link/a.jpg")) << "through a link";
  EXPECT_NO_THROW(sdk::SDKCredentials("root"));
}

}  // namespace
}  // namespace ferrox::test
