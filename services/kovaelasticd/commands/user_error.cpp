#include "services/kovaelasticd/commands/user_error.h"

namespace ferrox::engine {

std::string SentenceForUsers(const Error& error) {
  if (dynamic_cast<const UserError*>(&error) != nullptr) return error.what();
  switch (error.Code()) {
    case Error::kBadArgument:
    case Error::kEngineUnknownCommand:
    case Error::kEngineBadRequest:
    case Error::kEngineUserBusy:
      return error.what();
    case Error::kEngineBusyMemory:
      return "the engine is short of memory; ask again later";
    case Error::kEngineIndexPaused:
      return "the index of this share is paused";
    case Error::kEngineIndexRebuilding:
      return "the index of this share is being rebuilt; what it holds by now was searched";
    case Error::kEngineIndexUpgrading:
    case Error::kEngineIndexPreparing:
      return "the index of this share is being prepared";
    case Error::kEngineRightsUnknown:
      return "what you may read cannot be checked now; the administrator has to start kova-access "
             "('fileindexctl up')";
    default:
      return "this cannot be searched now; the administrator's log tells why";
  }
}

}  // namespace ferrox::engine
