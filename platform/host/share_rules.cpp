#include "platform/host/share_rules.h"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>

#include <kova/fs.h>
#include <kova/instance.h>

#include "base/path.h"
#include "base/text.h"

namespace kova::host {

namespace {

constexpr size_t kNameMaxBytes = 255;

bool IsControl(unsigned char c) { return c < 0x20 || c == 0x7f; }

std::string NameProblem(const std::string& name) {
  if (name.empty()) return "the share has no name; give one";
  if (name == "." || name == "..") return "\"" + name + "\" cannot be a share's name; choose another";
  if (name.find('/') != std::string::npos) return "a share's name cannot hold \"/\"; give the last part of the path";
  if (std::any_of(name.begin(), name.end(), IsControl)) {
    return "a share's name cannot hold control characters; choose another, and rename the folder";
  }
  if (name.size() > kNameMaxBytes) return "the share's name is over 255 bytes long; choose a shorter one";
  return {};
}

std::string LastComponentProblem(const std::string& name, const std::string& path) {
  const std::string last = base::NameOf(path);
  if (last == name) return {};
  const std::string hint = base::LowerAscii(last) == base::LowerAscii(name) ? " (upper and lower case count)" : "";
  return "the folder " + path + " is called \"" + last + "\", not \"" + name + "\"" + hint +
         ", and a share is called as its folder: name the share \"" + last +
         "\", or mount the folder under the wanted name (mkdir -p /srv/" + name + " && mount --bind '" + path +
         "' /srv/" + name + ") and share that";
}

}  // namespace

std::string ShareTextProblem(const std::string& name, const std::string& path) {
  std::string problem = NameProblem(name);
  if (!problem.empty()) return problem;
  if (path.empty() || path.front() != '/') {
    return "the path \"" + path + "\" of share \"" + name + "\" is not absolute; give one that begins with \"/\"";
  }
  if (path.size() >= PATH_MAX || path.find('\0') != std::string::npos) {
    return "the path of share \"" + name + "\" cannot be a path of this system; give a shorter one";
  }
  return LastComponentProblem(name, path);
}

std::string ShareFolderProblem(const ShareEntry& share) {
  struct stat info = {};
  if (stat(share.path.c_str(), &info) != 0) {
    const std::string reason = errno == ENOENT ? "does not exist; make it first" : strerror(errno);
    return "the folder " + share.path + " " + (errno == ENOENT ? reason : "cannot be examined: " + reason);
  }
  if (!S_ISDIR(info.st_mode)) return share.path + " is not a folder; share the folder that holds it";
  char resolved[PATH_MAX];
  if (realpath(share.path.c_str(), resolved) == nullptr) {
    return "the folder " + share.path + " cannot be resolved: " + strerror(errno);
  }
  if (share.path != resolved) {
    return "the path " + share.path + " goes through a link or is not in its plain form; share " + resolved +
           " under the name \"" + base::NameOf(resolved) + "\"";
  }
  if (KOVAGetFSType(share.path.c_str(), 0) == KOVA_FS_PSEUDO) {
    return share.path + " is the system's own and holds no files of users; choose another folder";
  }
  if (base::IsAtOrBelow(share.path, InstanceRoot() + "/var/lib/kova")) {
    return share.path + " holds the index's own files and cannot be a share; choose another folder";
  }
  return {};
}

}  // namespace kova::host
