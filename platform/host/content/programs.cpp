#include "platform/host/content/programs.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>

#include "base/path.h"

namespace kova::content {

namespace {

std::string FindFolder() {
  char self[4096] = {};
  const ssize_t length = readlink("/proc/self/exe", self, sizeof(self) - 1);
  const std::string own = length > 0 ? base::FolderOf(std::string(self, static_cast<size_t>(length))) : "";
  const char* given = secure_getenv("FERROX_LIBEXEC");
  for (const std::string& folder :
       {std::string(given != nullptr ? given : ""), own, base::FolderOf(own) + "/libexec"}) {
    struct stat info = {};
    const std::string path = folder + "/" + ProgramName(Program::kGeneral);
    if (!folder.empty() && stat(path.c_str(), &info) == 0 && S_ISREG(info.st_mode)) return folder;
  }
  return {};
}

}  // namespace

const std::string& ProgramFolder() {
  static const std::string folder = FindFolder();
  return folder;
}

bool IsInstalled(Program program) {
  return ProgramFolder().empty() || access((ProgramFolder() + "/" + ProgramName(program)).c_str(), X_OK) == 0;
}

}  // namespace kova::content
