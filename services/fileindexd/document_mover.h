#pragma once

#include <atomic>
#include <optional>
#include <string>
#include <vector>

#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/share_folders.h"
#include "services/fileindexd/share_index.h"

namespace ferrox::indexd {

/// Moves documents to the new path of what was renamed, to spare reading the files again. A rename is only a hint: a
/// document is moved when its stamp says that it describes what is at the new path, and both places are compared with
/// the disk afterwards in any case. Folding has carried later renames into the earlier ones, so the queue does not say
/// what happened step by step (two folders that were swapped, for example), and an earlier pass may have seen the disk
/// as it is now.
class DocumentMover {
 public:
  /// All outlive it; `root` is the share's folder.
  DocumentMover(const std::string& root, ShareIndex& index, const ShareFolders& folders, PathRules& rules,
                DocumentWriter& writer, const Interruption& interruption)
      : root_(root), index_(index), folders_(folders), rules_(rules), writer_(writer), interruption_(interruption) {}

  /// One request to the index: the documents at and below `old_path` go to `path`.
  struct Step {
    std::string path;
    std::string old_path;
  };
  /// The steps that the rename of `old_path` to `path` comes to: one where all of it is indexed, else one for each
  /// indexed folder in it. `old_path` lay outside the present root when the share itself was renamed or moved. For one
  /// thread.
  std::vector<Step> StepsOf(const std::string& path, const std::string& old_path);
  /// The earlier path of the share's folder, which is `top` or lies below it, by a sample of the documents there; ""
  /// when none of these describes a file that is in the share's folder now.
  std::string RootBeforeMove(const std::string& top);
  /// Whether the document at `path` is of the file or folder that `status` is of, wherever that is by now.
  bool DescribesFile(const std::string& path, const struct stat& status);
  /// Carries out a step if the documents describe what is at the new path. From any thread. @throws Interrupted; Error.
  void Move(const Step& step);
  /// Whether any of the steps so far moved a folder.
  bool MovedFolder() const { return moved_folder_; }

 private:
  std::vector<std::string> IndexedTopsOf(const std::string& path);
  std::optional<std::string> StampOfDocument(const std::string& old_path, const std::string& path);

  const std::string& root_;
  ShareIndex& index_;
  const ShareFolders& folders_;
  PathRules& rules_;
  DocumentWriter& writer_;
  const Interruption& interruption_;
  std::atomic<bool> moved_folder_{false};
};

}  // namespace ferrox::indexd
