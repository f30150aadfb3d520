#include "common/paths.h"

#include <kova/instance.h>

namespace ferrox {

std::string InstancePath(const char* fixed_path) { return kova::InstanceRoot() + fixed_path; }

std::string InstanceRootProblem() {
  const std::string& root = kova::InstanceRoot();
  if (root.empty()) return {};
  if (root.front() != '/') return "FERROX_ROOT=" + root + " is not an absolute path; give one that begins with /";
  const size_t longest = InstancePath(kContentExtractdSocket).size();
  if (longest <= kSocketPathMaxBytes) return {};
  return "FERROX_ROOT=" + root + " is " + std::to_string(longest - kSocketPathMaxBytes) +
         " bytes too long: socket paths are limited to " + std::to_string(kSocketPathMaxBytes) +
         " bytes; choose a shorter folder";
}

}  // namespace ferrox
