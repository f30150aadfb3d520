#pragma once

#include <string>

/// What the host's administrator may set: the JSON object in "/etc/kova/kova.json" below the instance's root.
///   {"admin_group": "sudo"}
namespace kova::host {

struct Configuration {
  std::string admin_group = "sudo";  ///< its members are administrators, beside root
  std::string problem = {};
};

/// The present configuration, re-read when its file has changed. False, with the failure recorded, when the file cannot
/// be used; a missing one is a configuration of defaults.
bool GetConfiguration(Configuration& configuration);

}  // namespace kova::host
