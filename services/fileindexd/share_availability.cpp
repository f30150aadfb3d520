#define FERROX_SOURCE "share_worker"

#include "services/fileindexd/share_availability.h"

#include <syslog.h>

#include <string>

#include "common/log.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"
#include "services/fileindexd/path_rules.h"

namespace ferrox::indexd {

using fileindex::StatusMgr;

void ShareAvailability::Check() {
  const sdk::SDKShare share(context_.share);
  FERROX_FAIL_IF(share.GetPath() != context_.root, Error::kNoSuchShare, "the share's folder is another one now");
  const std::string absence =
      AbsenceOf(context_.root, context_.applied.MountPoint(), context_.environment.is_mount_point);
  was_away_ = was_away_ || !absence.empty();
  FERROX_FAIL_IF(!absence.empty(), Error::kPathNotIndexable, absence);
  FERROX_FAIL_IF(is_full_ && !share.IsSpaceEnough(), Error::kSpaceNotEnough, "still less than 100 MiB free");
  const std::string problem = ShareProblem(context_.share, context_.root);
  FERROX_FAIL_IF(!problem.empty(), Error::kPathNotIndexable, problem);
}

bool ShareAvailability::IsOutOfSpace(const Error& error) const {
  if (error.Code() == Error::kSpaceNotEnough) return true;
  if (error.Code() != Error::kEngineStorage) return false;
  try {
    return !sdk::SDKShare(context_.share).IsSpaceEnough();
  } catch (const Error&) {
    return false;  // the share is gone; the failure that it led to says so
  }
}

void ShareAvailability::OnOutOfSpace(const Error& error) {
  if (is_full_) return;
  is_full_ = true;
  Log(LOG_ERR, "share %s: no space for its index: %s", context_.share.c_str(), error.what());
  fileindex::SendZEMNotify();
  try {
    StatusMgr().SetShareStatus(context_.share, StatusMgr::kNeedReindex);
  } catch (const Error&) {
    is_full_ = false;  // the disk may be too full even for the mark; the next round tries again
  }
}

}  // namespace ferrox::indexd
