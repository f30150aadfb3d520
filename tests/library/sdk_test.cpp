// Catches answers of the platform that are misread, and an identity or a lock that is not given back.
#include <unistd.h>

#include "common/sdk_mutex.h"
#include "sdk/credentials.h"
#include "sdk/share.h"
#include "tests/support/library_test.h"

namespace ferrox::sdk {

namespace {

using test::FailureOf;

class SDKTest : public test::LibraryTest {
 protected:
  void SetUp() override {
    platform_.shares["photo"] = {"/volume1/photo", 1};
    platform_.users["alice"] = {1000, 100, false, "", 0};
    platform_.users["boss"] = {1001, 100, true, "", 0};
    platform_.euid = platform_.egid = 0;
  }
  // Nothing may leave the mutex taken, on no way.
  void TearDown() override {
    const bool is_free = SDKMutex().TryLock();
    if (is_free) (void)SDKMutex().Unlock();
    ASSERT_TRUE(is_free);
  }
};

}  // namespace

TEST_F(SDKTest, TellsWhatThePlatformKnows) {
  const SDKShare share("photo");
  EXPECT_EQ(share.GetDBName(), "fileindex_photo");
  EXPECT_NE(share.GetDBPath(), share.GetQueuePath());
  EXPECT_EQ(share.GetFTPPrivilege(), 1U);
  platform_.shares["photo"].privileges["alice"] = KOVA_PRIV_READ_ONLY;
  EXPECT_EQ(share.GetPrivilege("alice"), KOVA_PRIV_READ_ONLY);
  EXPECT_LT(share.GetPrivilege("nobody-of-that-name"), 0);
  platform_.shares["music"] = {"/volume2/music"};
  EXPECT_EQ(SDKShare::Enum(), (std::vector<std::string>{"music", "photo"}));
}

TEST_F(SDKTest, OnlyExactlyOneIsYes) {
  const SDKShare share("photo");
  test::FakeShare& fake = platform_.shares["photo"];
  for (const int value : {0, 1, 2}) {
    SCOPED_TRACE(value);
    fake.recycle = fake.encryption = fake.hide_unreadable = value;
    EXPECT_EQ(share.IsEnableRecycleBin(), value == 1);
    EXPECT_EQ(share.IsEncryption(), value == 1);
    EXPECT_EQ(share.IsHideUnReadable(), value == 1);
    fake.encrypted = value, fake.read_only = 0;
    EXPECT_EQ(share.CanBeIndexed(), value == 0);
    fake.encrypted = 0, fake.read_only = value;
    EXPECT_EQ(share.CanBeIndexed(), value == 0);
  }
  platform_.failing["KLIBShareHideUnreadableGet"] = {};
  EXPECT_FALSE(share.IsHideUnReadable());
}

TEST_F(SDKTest, FailuresNameTheCallAndTheShare) {
  EXPECT_EQ(FailureOf([] { SDKShare missing("nope"); }), "800 nope");
  const SDKShare share("photo");
  const auto ask_all = [&share] {
    (void)share.GetDBName(), (void)share.GetDBPath(), (void)share.GetQueuePath();
    (void)share.IsEnableRecycleBin(), (void)share.IsEncryption(), (void)share.CanBeIndexed();
  };
  const auto check = [&](const std::string& call, const std::string& name) {
    platform_.failing = {{call, {}}};
    EXPECT_EQ(FailureOf(ask_all), "502 " + name + " failed, share=photo");
  };
  for (const char* call : {"FILEIDXGetIndexID", "FILEIDXDBPathCompose", "FILEIDXQueuePathCompose",
                           "KLIBShareRecycleStatusGet", "KLIBShareIsEncryptionGet"}) {
    check(call, call);
  }
  check("KLIBShareIsEncryptedGet", "KLIBShareis_encryptedGet");
  check("KLIBShareIsReadOnlyGet", "KLIBShareis_readonlyGet");
  platform_.failing = {{"KLIBShareEnum", {}}};
  EXPECT_EQ(FailureOf([] { SDKShare::Enum(); }), "121 KLIBShareEnum failed");
}

TEST_F(SDKTest, OnlyLackOfSpaceIsLackOfSpace) {
  const SDKShare share("photo");
  EXPECT_TRUE(share.IsSpaceEnough());
  EXPECT_TRUE(platform_.Called("KOVAQuotaIsEnough(0, /volume1/photo, 104857600)"));
  for (const auto& [code, enough] :
       {std::pair<int, bool>{0x2900, false}, {0x2400, false}, {KOVA_ERR_SYSTEM, true}, {KOVA_ERR_NONE, true}}) {
    platform_.failing["KOVAQuotaIsEnough"] = {code};
    EXPECT_EQ(share.IsSpaceEnough(), enough) << code;
  }
}

TEST_F(SDKTest, GivesTheIdentityBack) {
  {
    SDKCredentials credentials;
    credentials.AsUser("alice");
    EXPECT_EQ(geteuid(), 1000U);
  }
  EXPECT_EQ(platform_.switches, (std::vector<std::string>{"alice", "root"}));
  EXPECT_EQ(geteuid(), 0U);
  platform_.switches.clear();
  platform_.euid = 1000;
  { const SDKCredentials credentials("boss"); }
  EXPECT_EQ(platform_.switches, (std::vector<std::string>{"root", "alice"})) << "an administrator works as root";
  platform_.calls.clear();
  { const SDKCredentials credentials; }
  EXPECT_EQ(platform_.CallCount("ResetCredentialsByName"), 0) << "nothing changed, nothing to restore";
}

TEST_F(SDKTest, FailuresAreThrownAlsoAtTheEnd) {
  platform_.failing["KOVAUserGetByUID"] = {0x1D00, 0, 1};
  EXPECT_EQ(FailureOf([] { SDKCredentials credentials; }), "503 KOVAUserGetByUID failed, err=7424");
  EXPECT_EQ(FailureOf([] { SDKCredentials credentials("stranger"); }), "503 ");
  platform_.failing["ResetCredentialsByName"] = {KOVA_ERR_SYSTEM, 1, 1};
  EXPECT_EQ(FailureOf([] { SDKCredentials credentials("alice"); }), "503 ");
  EXPECT_TRUE(log_.Contains("(~SDKCredentials) Failed [!ResetCredentialsByName(username_)]"));
  // While another failure is on its way the second one is only logged.
  platform_.euid = 0;
  platform_.failing["ResetCredentialsByName"] = {KOVA_ERR_SYSTEM, 1, 1};
  EXPECT_EQ(FailureOf([] {
              const SDKCredentials credentials("alice");
              throw Error(Error::kInternal, "first");
            }),
            "502 first");
}

}  // namespace ferrox::sdk
