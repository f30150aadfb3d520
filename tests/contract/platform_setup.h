#pragma once

#include <string>
#include <vector>

/// How the contract's tests put an implementation of the platform into a state. One source for each implementation.
namespace ferrox::test {

struct ShareSetup {
  std::string name;
  std::string path;  ///< an existing folder that ends in the name
  bool recycle = false;
  bool encrypted = false;
  bool locked = false;
  bool read_only = false;
  bool hide_unreadable = false;
};

/// Makes these the platform's shares, and no others.
void SetShares(const std::vector<ShareSetup>& shares);

}  // namespace ferrox::test
