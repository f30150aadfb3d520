#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include <json/value.h>

namespace ferrox::indexd {

/// The files of a share that could not be indexed as they should: how many for each reason, and three paths for each as
/// examples. A reason may hold text of a file's making, so only 100 different ones are kept; the others count together.
/// Not locked: ShareStatus guards it.
class FileFailures {
 public:
  void Add(const std::string& reason, const std::string& path);
  uint64_t Count() const;
  /// Reason to {"count", "examples"}.
  Json::Value ToJson() const;

 private:
  struct Failure {
    uint64_t count = 0;
    std::vector<std::string> examples;
  };
  std::map<std::string, Failure> by_reason_;
};

}  // namespace ferrox::indexd
