#pragma once

#include <cstdint>
#include <string>
#include <vector>

/// What MonitorQueue of kova/notifyd.h keeps on disk for the notification daemon: docs/formats/notifyd.md.
namespace kova::host {

/// One watched folder of a registration.
struct Watch {
  std::string path;
  uint32_t mask = 0;
  std::vector<std::string> ignore = {};
};

/// One queue of an application, and the folders that are reported into it.
struct Registration {
  std::string application;
  int type = 0;
  std::string queue;
  std::vector<Watch> watches = {};
};

struct Registrations {
  std::vector<Registration> list;     ///< in ascending order of their files' names
  std::vector<std::string> problems;  ///< a sentence for each file that cannot be used
};

/// The folder that holds one file for each registration. A file is renamed into place and never changed there: who
/// watches the folder for renames into it and for removals sees each change. Names that do not end in ".json" are files
/// that are being written, or were when their writer died.
std::string RegistryFolder();

/// All registrations as they stand now. A file that cannot be used takes nothing from the others.
Registrations ReadRegistrations();

}  // namespace kova::host
