#pragma once

#include <chrono>

#include "services/fileindexd/access_follower.h"
#include "services/fileindexd/anchors.h"
#include "services/fileindexd/change_follower.h"
#include "services/fileindexd/document_writer.h"

namespace ferrox::indexd {

/// Commits what a pass has written: at its end, and every five seconds, so that what a long pass writes becomes
/// searchable and durable meanwhile. Belongs to the pass's thread.
class PassCommits {
 public:
  /// All outlive it.
  PassCommits(DocumentWriter& writer, Anchors& anchors, ChangeFollower& changes, AccessFollower& access)
      : writer_(writer), anchors_(anchors), changes_(changes), access_(access) {}

  /// With the rights of the folders that have no documents, when anything was written. @throws Error.
  void Commit() {
    if (writer_.HasUncommitted()) anchors_.Record();
    writer_.Commit();
    last_ = std::chrono::steady_clock::now();
  }
  /// Commits when something was written and the interval is over. To be called after each piece of work. @throws Error;
  /// what ended one of the followers, so that a pass does not go on for long without it.
  void CommitIfDue() {
    changes_.ThrowIfFailed();
    access_.ThrowIfFailed();
    if (writer_.HasUncommitted() && std::chrono::steady_clock::now() - last_ >= kInterval) Commit();
  }

 private:
  static constexpr std::chrono::seconds kInterval{5};

  DocumentWriter& writer_;
  Anchors& anchors_;
  ChangeFollower& changes_;
  AccessFollower& access_;
  std::chrono::steady_clock::time_point last_ = std::chrono::steady_clock::now();
};

}  // namespace ferrox::indexd
