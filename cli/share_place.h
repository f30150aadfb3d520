#pragma once

#include <string>
#include <vector>

/// Where a file lies, as the index sees it, and what of its place keeps it out of the index. Only looks.
namespace ferrox::cli {

/// A share and its folder.
struct SharePlace {
  std::string share;
  std::string root;
};

/// The indexed shares that lie in the folder `root`, not at it: a file of theirs is indexed there alone.
std::vector<SharePlace> IndexedSharesBelow(const std::string& root);

/// Whose index a file at a full path is for: the deepest indexed share that it lies in. Both empty when there is none.
SharePlace IndexedShareOf(const std::string& path);

/// Why nothing below `folder`, at or below the share's folder `root`, is indexed whatever it is: its name, or that of a
/// folder above it, is one that systems give their own files, it lies in a recycle bin or snapshot, something is
/// mounted there. A sentence without its end, with the remedy; "" when nothing of that is so. Folders above `root` and
/// it itself are not asked about; what another share has is not known here.
std::string WhyFolderLeftOut(const std::string& root, const std::string& folder);

/// The same for the name of a single file or folder.
std::string WhyNameLeftOut(const std::string& name);

}  // namespace ferrox::cli
