#include "cli/global_options.h"

#include <cstdlib>

#include "cli/command.h"
#include "cli/folder_path.h"

namespace ferrox::cli {

namespace {

/// Made absolute, since daemons that are started work from another folder.
void UseRoot(const std::string& root) {
  if (root.empty()) throw UsageError("--root needs a folder");
  const std::string absolute = FromWorkingFolder(root, "--root a path that begins with /");
  (void)setenv("FERROX_ROOT", absolute.c_str(), 1);
}

}  // namespace

void TakeRoot(std::vector<std::string>& words) {
  while (!words.empty() && (words[0] == "--root" || words[0].compare(0, 7, "--root=") == 0)) {
    const bool joined = words[0] != "--root";
    if (!joined && words.size() == 1) throw UsageError("--root needs a folder");
    UseRoot(joined ? words[0].substr(7) : words[1]);
    words.erase(words.begin(), words.begin() + (joined ? 1 : 2));
  }
}

}  // namespace ferrox::cli
