#pragma once

#include <map>
#include <string>
#include <tuple>
#include <vector>

#include <json/value.h>

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

/// Makes `homes` the share of that name, with a recycle bin in the home of "root", whose account is a local one, and in
/// a folder "no-such-user-here". Returns their paths.
std::vector<std::string> SetHomes(const std::string& homes);

/// Makes a file-sharing service that offers these shares, with Spotlight on or off in each.
void SetSpotlight(const std::map<std::string, bool>& shares);

/// The registrations of MonitorQueue: application, type and document.
using RegisteredQueue = std::tuple<std::string, int, Json::Value>;
std::vector<RegisteredQueue> RegisteredQueues();

}  // namespace ferrox::test
