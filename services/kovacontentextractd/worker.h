#pragma once

#include "services/kovacontentextractd/readers/reader.h"

/// The main part of every worker program.
namespace ferrox::extract {

/// A reader by the name that kova::content::Format has for it.
struct ReaderRow {
  const char* name;
  Reader reader;
};

/// What makes a worker program.
struct Worker {
  const ReaderRow* readers;
  size_t reader_count;
  /// Loads what the readers need from the disk; called once, before the sandbox closes.
  void (*prepare)();
};

/// Loads what the readers need, gives up all rights, and then makes workers, as the daemon asks for them, by forks.
/// Each of these closes its sandbox, says what of it could not be had, and reads files; all until the daemon hangs up.
/// `empty_folder` becomes the root of their file system where that is allowed. @return the exit status, of each
/// process.
int RunWorker(const Worker& worker, const char* empty_folder);

}  // namespace ferrox::extract
