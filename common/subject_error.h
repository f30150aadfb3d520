#pragma once

#include <cstdint>
#include <string>

#include "common/error.h"
#include "common/export.h"

namespace ferrox {

/// What a call was about that failed: the kind of thing and, where it has one, its name. For programs that explain a
/// failure in words of their own: the reason's text is for the log and for people, and is not to be taken apart.
struct Subject {
  /// The numbers never change; new kinds are added at the end.
  enum Kind : int32_t {
    kUnknown = 0,         ///< nothing is said besides code and reason
    kShare = 1,           ///< a share, by its name
    kShares = 2,          ///< the list of all shares; no name
    kUser = 3,            ///< a user, by name
    kFolder = 4,          ///< a folder that is, or was to be, indexed, by its share path
    kFolders = 5,         ///< the list of indexed folders, or several of them; no name
    kServices = 6,        ///< the services that indexing needs; no name
    kFile = 7,            ///< a file of the configuration that cannot be read, written or given its mode, by full path
    kLock = 8,            ///< a lock file that stayed taken, by full path
    kShareOfPath = 9,     ///< the share that holds a full path, which is the name
    kQueuePlace = 10,     ///< where the queue of a share lies, by the full path of the share's folder
    kIndexPlace = 11,     ///< where the index of a share lies, likewise
    kWatching = 12,       ///< what is registered with the notification daemon for a share, by the share's name
    kWatchingEnd = 13,    ///< taking that registration back, likewise
    kDaemonChannel = 14,  ///< the command channel of the index daemon; no name
    kEngineConnect = 15,  ///< the connection to the search engine; no name
    kEngineSend = 16,     ///< a request that the search engine did not take; no name
    kEngineReply = 17,    ///< a reply of the search engine that did not come or cannot be used; no name
    kEngineRefusal = 18,  ///< the search engine's own sentence, with its own code, is the name
    kJson = 19,           ///< a JSON value; the name says what is wrong with it, without the value's text
  };

  Kind kind = kUnknown;
  std::string name;
};

/// An Error that says what it is about. A handler for Error catches these, too; it passes them on with
/// "throw;", since a copy as an Error drops the subject.
class FERROX_EXPORT SubjectError : public Error {
 public:
  SubjectError(ErrorCode code, const std::string& reason, Subject subject);
  SubjectError(const SubjectError&) = default;
  SubjectError& operator=(const SubjectError&) = default;
  ~SubjectError() override;

  const Subject& About() const noexcept { return subject_; }
  /// What any Error is about; kUnknown for one that does not say.
  static Subject Of(const Error& error);

 private:
  Subject subject_;
};

}  // namespace ferrox
