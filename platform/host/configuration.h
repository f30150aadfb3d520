#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "base/pattern_lists.h"

/// What the host's administrator may set: the JSON object in "/etc/kova/kova.json" below the instance's root.
///   {"admin_group": "sudo", "samba": {"shares": true}}
namespace kova::host {

struct Configuration {
  std::string admin_group = "sudo";  ///< its members are administrators, beside root
  struct Samba {
    std::string config;                          ///< its configuration's text
    bool shares = false;                         ///< whether its shares are shares here
    std::string testparm = "/usr/bin/testparm";  ///< the program that lists them
    /// What reaches its running processes; empty in an instance that is not the host's own, unless it is set.
    std::string smbcontrol;
  } samba = {};
  struct Notifyd {
    /// By which ways the notification daemon may watch folders.
    std::vector<std::string> watch = {"fanotify", "fanotify inode marks", "inotify", "periodic scan"};
    uint32_t scan_interval_sec = 600;  ///< between the scans of what it cannot watch
  } notifyd = {};
  struct Web {
    /// Where the web daemon listens, "127.0.0.1:9280"; in an instance that is not the host's own, a free port.
    std::vector<std::string> addresses;
    std::vector<std::string> hosts = {"localhost"};  ///< names, beside its addresses, by which it may be asked
  } web = {};
  struct Engine {
    uint32_t memory_mib = 0;  ///< what searches may hold in long lists; 0: by the host's memory
  } engine = {};
  /// Users whose programs may search for others, and the least uid that they may search for.
  std::vector<std::string> trusted_clients = {};
  uint32_t least_user = 1000;
  /// What is left out of all indexed folders (platform/host/exclusion_settings.h).
  struct Exclusions {
    bool defaults = true;  ///< the built-in patterns count
    base::PatternLists lists = {};
  } exclusions = {};
  std::string problem = {};  ///< why the file cannot be used, for people; empty when it can
};

/// Where the file of this instance is.
std::string ConfigurationPath();

/// The present configuration, re-read when its file has changed; a missing file is a configuration of defaults.
/// A `problem` is logged when it is found.
std::shared_ptr<const Configuration> GetConfiguration();

}  // namespace kova::host
