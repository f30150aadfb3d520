#pragma once

#include <chrono>

#include "services/fileindexd/change_follower.h"
#include "services/fileindexd/document_writer.h"

namespace ferrox::indexd {

/// Commits what a pass has written: at its end, and every five seconds, so that what a long pass writes becomes
/// searchable and durable meanwhile. Belongs to the pass's thread.
class PassCommits {
 public:
  /// Both outlive it.
  PassCommits(DocumentWriter& writer, ChangeFollower& follower) : writer_(writer), follower_(follower) {}

  /// @throws Error.
  void Commit() {
    writer_.Commit();
    last_ = std::chrono::steady_clock::now();
  }
  /// Commits when something was written and the interval is over. To be called after each piece of work. @throws Error;
  /// what ended the early writes, so that a pass does not go on for long without them.
  void CommitIfDue() {
    follower_.ThrowIfFailed();
    if (writer_.HasUncommitted() && std::chrono::steady_clock::now() - last_ >= kInterval) Commit();
  }

 private:
  static constexpr std::chrono::seconds kInterval{5};

  DocumentWriter& writer_;
  ChangeFollower& follower_;
  std::chrono::steady_clock::time_point last_ = std::chrono::steady_clock::now();
};

}  // namespace ferrox::indexd
