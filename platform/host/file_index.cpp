#include <kova/file_index.h>

#include "platform/shared/failure.h"
#include "platform/shared/index_paths.h"
#include "platform/shared/records.h"

namespace {

/// Gives out what was composed; the reason of an empty text is recorded already.
int Give(const std::string& composed, char* buffer, size_t size) {
  return !composed.empty() && kova::CopyOut(composed, buffer, size) ? 0 : -1;
}

}  // namespace

int FILEIDXGetIndexID(const char* share_name, char* buffer, size_t size) {
  if (share_name == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  return Give(std::string("fileindex_") + share_name, buffer, size);
}

int FILEIDXDBPathCompose(const char* share_path, char* buffer, size_t size) {
  if (share_path == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  return Give(kova::ComposeDBPath(share_path), buffer, size);
}

int FILEIDXQueuePathCompose(const char* share_path, char* buffer, size_t size) {
  if (share_path == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  return Give(kova::ComposeQueuePath(share_path), buffer, size);
}
