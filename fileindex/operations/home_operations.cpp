#define FERROX_SOURCE "index_mgr"
#include <syslog.h>

#include <cerrno>
#include <functional>
#include <memory>
#include <vector>

#include <json/value.h>

#include <kova/recycle.h>
#include <kova/string_list.h>

#include "base/path.h"
#include "common/log.h"
#include "common/sdk_mutex.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/folder_patterns.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/operations/operation_steps.h"
#include "fileindex/queue/custom_event.h"
#include "fileindex/queue/event.h"
#include "fileindex/util.h"

namespace ferrox::fileindex {

namespace {

constexpr int kListCapacity = 1024;
constexpr char kHomes[] = "/homes/";

/// How the homes' recycle bins are enumerated, and how the log names it.
struct Enumeration {
  const char* operation;
  const char* function;
  const char* condition;
  std::function<int(KLIBCSzList**)> run;
};

void Report(const Enumeration& enumeration, const char* condition, const std::string& reason,
            int line = __builtin_LINE()) {
  LogFailure({FERROX_SOURCE, line, enumeration.operation, condition}, errno, reason);
}

/// Has every home recycle bin that is enumerated compared with the index. Failures are logged and end it.
void ReindexHomeRecycleBins(AUTH_TYPE auth, const Enumeration& enumeration) {
  errno = 0;
  KLIBCSzList* list = KLIBCSzListAlloc(kListCapacity);
  const std::unique_ptr<KLIBCSzList*, void (*)(KLIBCSzList**)> owner(&list,
                                                                     [](KLIBCSzList** l) { KLIBCSzListFree(*l); });
  if (list == nullptr)
    return Report(enumeration, "nullptr == (list = KLIBCSzListAlloc(1024))", "KLIBCSzListAlloc failed");
  int count = 0;
  {
    const LockMutex guard(sdk::SDKMutex());
    count = enumeration.run(&list);
  }
  if (count < 0) {
    return Report(enumeration, enumeration.condition,
                  std::string(enumeration.function) + " failed. auth: " + std::to_string(static_cast<int>(auth)));
  }
  CustomEventWriter events;
  for (int i = 0; i < list->count; ++i) {
    const std::string path = KLIBCSzListGet(list, i);
    if (path.empty()) continue;
    try {
      events.Add(EVENT_REINDEX, path, "", Json::Value());
    } catch (const Error& error) {
      return Report(enumeration, "AddCustomEvent(EVENT_REINDEX, path, \"\", Json::Value())",
                    std::string(error.what()) + ", not queued from here on: " + path);
    }
  }
}

}  // namespace

void HomeEnable(AUTH_TYPE auth) {
  ReindexHomeRecycleBins(
      auth, {__func__, "KOVARecycleHomeEnumRecyclePathForAuthType",
             "0 > KOVARecycleHomeEnumRecyclePathForAuthType(&list, auth)",
             [auth](KLIBCSzList** list) { return KOVARecycleHomeEnumRecyclePathForAuthType(list, auth); }});
}

// Deliberate: of all kinds of accounts, whatever `auth` is.
void HomeDisable(AUTH_TYPE auth) {
  ReindexHomeRecycleBins(auth, {__func__, "KOVARecycleHomeEnumRecyclePath", "0 > KOVARecycleHomeEnumRecyclePath(&list)",
                                &KOVARecycleHomeEnumRecyclePath});
}

void UserRename(const std::string& user_from, const std::string& user_to) {
  FERROX_FAIL_IF(user_from.empty(), Error::kBadArgument, "Missing user_from");
  FERROX_FAIL_IF(user_to.empty(), Error::kBadArgument, "Missing user_to");
  const FolderMgr folder_mgr;
  const std::string home_from = kHomes + user_from;
  const std::string home_to = kHomes + user_to;
  for (const std::shared_ptr<Folder>& folder : folder_mgr.GetFolders()) {
    const std::string path = folder->GetPath();
    if (!base::IsAtOrBelow(path, home_from)) continue;
    folder->SetPath(home_to + path.substr(home_from.size()));
    // Deliberate: of the log's error priority.
    Log(LOG_ERR, "%s:%d Update homes rule: [%s] -> [%s]", ModuleName(FERROX_SOURCE).c_str(), __LINE__, path.c_str(),
        folder->GetPath().c_str());
  }
  OperationSteps steps(__func__);
  AddSaveStep(steps, folder_mgr, [&] { CopyFolderPatterns(home_from, home_to); });
  steps.Add("queue the rename of " + user_from, {Subject::kUser, user_from},
            [&] { AddCustomEvent(EVENT_RENAME, GetFullPath(home_to), GetFullPath(home_from), Json::Value()); });
  steps.Run();
}

}  // namespace ferrox::fileindex
