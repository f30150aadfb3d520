#include "sdk/share.h"

#include <kova/error.h>
#include <kova/file_index.h>
#include <kova/share.h>

#include "common/log.h"
#include "common/sdk_mutex.h"

namespace ferrox::sdk {

namespace {

constexpr size_t kIndexIDBytes = 1024;
constexpr size_t kPathBytes = 4096;
constexpr int64_t kEnoughSpaceBytes = 100LL << 20;
constexpr int kListCapacity = 1024;

struct ListFree {
  void operator()(KLIBCSzList* list) const { KLIBCSzListFree(list); }
};

}  // namespace

void SDKShare::RecordFree::operator()(KOVAShare* record) const { KOVAShareFree(record); }

SDKShare::SDKShare(const std::string& share_name) : share_name_(share_name) {
  const LockMutex guard(SDKMutex());
  KOVAShare* record = nullptr;
  const int result = KOVAShareGet(share_name_.c_str(), &record);
  share_info_.reset(record);
  FERROX_FAIL_IF_AS(0 > result || !share_info_, "0 > KOVAShareGet(share_name.c_str(), &share_info_) || !share_info_",
                    Error::kNoSuchShare, share_name_);
}

SDKShare::~SDKShare() {
  const LockMutex guard(SDKMutex());
  share_info_.reset();
}

std::string SDKShare::GetPath() const { return share_info_->path; }

std::string SDKShare::GetDBName() const {
  char buffer[kIndexIDBytes] = {};
  const LockMutex guard(SDKMutex());
  FERROX_FAIL_IF(0 > FILEIDXGetIndexID(share_info_->name, buffer, sizeof(buffer)), Error::kInternal,
                 "FILEIDXGetIndexID failed, share=" + share_name_);
  return buffer;
}

std::string SDKShare::GetDBPath() const {
  char buffer[kPathBytes] = {};
  const LockMutex guard(SDKMutex());
  FERROX_FAIL_IF(0 > FILEIDXDBPathCompose(share_info_->path, buffer, sizeof(buffer)), Error::kInternal,
                 "FILEIDXDBPathCompose failed, share=" + share_name_);
  return buffer;
}

std::string SDKShare::GetQueuePath() const {
  char buffer[kPathBytes] = {};
  const LockMutex guard(SDKMutex());
  FERROX_FAIL_IF(0 > FILEIDXQueuePathCompose(share_info_->path, buffer, sizeof(buffer)), Error::kInternal,
                 "FILEIDXQueuePathCompose failed, share=" + share_name_);
  return buffer;
}

bool SDKShare::IsEnableRecycleBin() const {
  int status = 0;
  const LockMutex guard(SDKMutex());
  FERROX_FAIL_IF(0 > KLIBShareRecycleStatusGet(share_info_.get(), &status), Error::kInternal,
                 "KLIBShareRecycleStatusGet failed, share=" + share_name_);
  return status == 1;
}

bool SDKShare::IsEncryption() const {
  int value = 0;
  const LockMutex guard(SDKMutex());
  FERROX_FAIL_IF(0 > KLIBShareIsEncryptionGet(share_info_.get(), &value), Error::kInternal,
                 "KLIBShareIsEncryptionGet failed, share=" + share_name_);
  return value == 1;
}

bool SDKShare::CanBeIndexed() const {
  int is_encrypted = 0;
  int is_readonly = 0;
  const LockMutex guard(SDKMutex());
  FERROX_FAIL_IF(0 > KLIBShareIsEncryptedGet(share_info_.get(), &is_encrypted), Error::kInternal,
                 "KLIBShareis_encryptedGet failed, share=" + share_name_);
  FERROX_FAIL_IF(0 > KLIBShareIsReadOnlyGet(share_info_.get(), &is_readonly), Error::kInternal,
                 "KLIBShareis_readonlyGet failed, share=" + share_name_);
  return is_encrypted == 0 && is_readonly == 0;
}

bool SDKShare::IsSpaceEnough() const {
  const LockMutex guard(SDKMutex());
  if (KOVAQuotaIsEnough(0, share_info_->path, kEnoughSpaceBytes) != 0) return true;
  const int error = KLIBCErrGet();
  return error != KOVA_ERR_OVER_QUOTA && error != KOVA_ERR_OUT_OF_SPACE;
}

bool SDKShare::IsHideUnReadable() const {
  int value = 0;
  return KLIBShareHideUnreadableGet(share_info_.get(), &value) >= 0 && value == 1;
}

int SDKShare::GetPrivilege(const std::string& user) const {
  return KOVAShareUserPrivGet(user.c_str(), share_info_.get());
}

uint32_t SDKShare::GetFTPPrivilege() const { return share_info_->ftp_privilege; }

std::vector<std::string> SDKShare::Enum() {
  const LockMutex guard(SDKMutex());
  KLIBCSzList* list = KLIBCSzListAlloc(kListCapacity);
  FERROX_FAIL_IF_AS(list == nullptr, "!(list = KLIBCSzListAlloc(1024))", Error::kShareEnumFailed,
                    "KLIBCSzListAlloc failed");
  const KOVAShareFilter every_share = {};
  const int result = KLIBShareEnum(&list, &every_share);
  const std::unique_ptr<KLIBCSzList, ListFree> owner(list);  // only now: the list may have moved
  FERROX_FAIL_IF_AS(0 > result, "0 > KLIBShareEnum(&list, &filter)", Error::kShareEnumFailed, "KLIBShareEnum failed",
                    Subject{Subject::kShares, ""});
  std::vector<std::string> names;
  names.reserve(static_cast<size_t>(list->count));
  for (int i = 0; i < list->count; ++i) names.emplace_back(KLIBCSzListGet(list, i));
  return names;
}

}  // namespace ferrox::sdk
