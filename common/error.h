#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>

#include "common/export.h"

namespace ferrox {

/// What the library throws. A failure is thrown after its line is in the log (common/log.h), so that a catch logs
/// nothing again. `what()` is the reason alone (empty when none was given); the composed text, code and reason, is the
/// base class's message: `error.std::runtime_error::what()`.
class FERROX_EXPORT Error : public std::runtime_error {
 public:
  /// The numbers are shared with the search engine's replies and with callers: they never change. An engine may report
  /// codes that are not listed; they are carried as they are.
  enum ErrorCode : int32_t {
    kBadArgument = 120,             ///< a bad or missing argument, or JSON that is not as it must be
    kShareEnumFailed = 121,         ///< the shares cannot be enumerated
    kInternal = 502,                ///< a platform or system call failed
    kCredentialsFailed = 503,       ///< the identity cannot be switched or restored
    kLoadFailed = 504,              ///< a configuration file cannot be loaded
    kSaveFailed = 505,              ///< a configuration file cannot be saved
    kLockFailed = 506,              ///< a lock file cannot be taken
    kNoSuchShare = 800,             ///< there is no such share
    kChownFailed = 801,             ///< a file cannot be handed to the package's user
    kTooManyFolders = 900,          ///< more indexed folders than the maximum
    kDuplicatedFolder = 901,        ///< the folder is configured already
    kNoSuchFolder = 902,            ///< there is no such configured folder
    kPathNotIndexable = 903,        ///< the path cannot be indexed
    kMalformedEvent = 906,          ///< a queue line that is no event
    kEngineUnreachable = 913,       ///< the search engine cannot be reached, or its reply is unusable
    kParseFailed = 914,             ///< a file's document cannot be built
    kBadEngineReply = 916,          ///< the engine's reply lacks its "data" array
    kSpaceNotEnough = 1003,         ///< the share's volume is full
    kEngineBusy = 1400,             ///< the engine is busy; ask again later
    kEngineBusyMemory = 1401,       ///< the engine is short of memory or disk; ask again later
    kEngineUnknownCommand = 1402,   ///< the engine knows no such command
    kEngineBadRequest = 1403,       ///< a member of a request is missing or unusable; nothing was changed
    kEngineNoSuchIndex = 1404,      ///< the engine has no such index
    kEngineNoSuchDocument = 1405,   ///< the index has no such document
    kEngineNotPermitted = 1406,     ///< the asking user may not do this
    kEngineStorage = 1407,          ///< the index cannot be read or written, for example because the disk is full
    kEngineIndexExists = 1408,      ///< an index of that id exists already, at another place
    kEngineIndexPaused = 1409,      ///< the index is paused
    kEngineIndexRebuilding = 1410,  ///< the index is being rebuilt; what it holds by now was searched
    kEngineIndexUpgrading = 1411,   ///< the index is brought to the present format; only searches are answered
    kEngineIndexPreparing = 1412,   ///< the rights of its files are still being recorded; it is not searched for users
    kEngineRightsUnknown = 1413,    ///< what the asking user may read cannot be checked now; nothing was shown
    kEngineUserBusy = 1414,         ///< the asking user, or all users together, have too many requests at work
    kTreeInconsistent = 9999,       ///< a path that the operation tree cannot hold
  };

  /// Neither constructor logs; failures that nothing has logged go through Fail (common/log.h).
  explicit Error(ErrorCode code);
  Error(ErrorCode code, const std::string& reason);
  Error(const Error&) = default;
  Error& operator=(const Error&) = default;
  ~Error() override;

  /// The reason alone. Lives as long as the error.
  const char* what() const noexcept override;
  ErrorCode Code() const noexcept { return code_; }

 private:
  ErrorCode code_;
  std::string reason_;
};

}  // namespace ferrox
