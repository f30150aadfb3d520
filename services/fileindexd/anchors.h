#pragma once

#include <string>
#include <vector>

#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/share_folders.h"

namespace ferrox::indexd {

/// The share's folder and those on the way from it to the configured ones. They have no documents, but whoever may not
/// pass them may read nothing below: the index keeps their rights with its tree of folders, as long as it has documents
/// below. Nobody reports each of their changes, so they are recorded anew whenever something was written.
class Anchors {
 public:
  /// `writer` outlives it; `root` is the share's folder.
  Anchors(const std::string& root, const ShareFolders& folders, DocumentWriter& writer);

  const std::vector<std::string>& Paths() const { return paths_; }
  /// @throws Error.
  void Record();

 private:
  DocumentWriter& writer_;
  std::vector<std::string> paths_;
};

}  // namespace ferrox::indexd
