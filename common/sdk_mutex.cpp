#include "common/sdk_mutex.h"

namespace ferrox::sdk {

Mutex& SDKMutex() {
  static Mutex mutex;
  return mutex;
}

}  // namespace ferrox::sdk
