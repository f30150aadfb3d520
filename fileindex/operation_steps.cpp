#define FERROX_SOURCE "index_mgr"

#include "fileindex/operation_steps.h"

#include <syslog.h>
#include <unistd.h>

#include "common/error.h"
#include "common/log.h"

namespace ferrox::fileindex {

void OperationSteps::Run() const {
  for (size_t i = 0; i < steps_.size(); ++i) {
    try {
      steps_[i].run();
    } catch (const Error& error) {
      LogNotDone(i, error.what());
      throw;
    }
  }
}

void OperationSteps::LogNotDone(size_t first, const char* reason) const {
  std::string not_done;
  for (size_t i = first; i < steps_.size(); ++i) not_done += (i == first ? "" : "; ") + steps_[i].what;
  Log(LOG_ERR, "%s:%d (%d, %u) (%s) Stopped, reason: %s. Not done: %s", ModuleName(FERROX_SOURCE).c_str(), __LINE__,
      getpid(), geteuid(), operation_, reason, not_done.c_str());
}

}  // namespace ferrox::fileindex
