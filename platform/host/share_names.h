#pragma once

#include <string>
#include <vector>

#include <json/value.h>

#include "platform/host/smb_conf.h"

namespace kova::host {

/// The names of files and folders that a share does not show over the network. As the rules of ShareUsers they hold for
/// users for whom another program asks. A pattern is compared with single names, never with paths: "*" stands for any
/// characters, "?" for one.
struct ShareNames {
  std::vector<std::string> veto = {};  ///< they do not exist
  std::vector<std::string> hide = {};  ///< they are left out where names are listed
  bool case_counts = false;
  /// Why nobody is let in, a sentence without its end: patterns that cannot be judged here. Empty: the lists hold.
  std::string closed = {};
};

/// Those of an element of the share table, whose lists are texts such as "/.DS_Store/~*/". @return what is wrong with
/// them, as the end of a sentence; "" when nothing is.
std::string ReadNames(const Json::Value& object, ShareNames& names);

/// The patterns in a section of what testparm prints.
ShareNames SambaNames(const SmbConf& conf, const std::string& section);

}  // namespace kova::host
