#pragma once

#include <string>
#include <vector>

/// How the contract's tests put an implementation of the platform into a state. One source for each implementation.
namespace ferrox::test {

struct ShareSetup {
  std::string name;
  std::string path;  ///< an existing folder that ends in the name
  /// Letters: 'r' has a recycle bin, 'e' is encrypted, 'l' is locked, 'o' is read-only, 'h' hides the unreadable.
  std::string flags = {};

  bool Has(char flag) const { return flags.find(flag) != std::string::npos; }
};

/// Makes these the platform's shares, and no others.
void SetShares(const std::vector<ShareSetup>& shares);

}  // namespace ferrox::test
