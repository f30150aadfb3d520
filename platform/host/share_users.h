#pragma once

#include <string>
#include <vector>

#include "platform/host/smb_conf.h"

namespace kova::host {

/// Whom the rules of a share let in. They hold for users for whom another program asks, as one that serves the web
/// does; who works on the host itself is judged by the rights of files alone.
///
/// A name is that of a user as the name service knows it, also "DOMAIN\name"; "+name" is a group, "@name" a netgroup
/// or a group of that name. Nothing here asks the name service.
struct ShareUsers {
  std::vector<std::string> valid = {};    ///< nobody else; none: everybody
  std::vector<std::string> invalid = {};  ///< not these, whatever `valid` says
  /// Why nobody is let in, a sentence without its end: a rule that cannot be judged here. Empty: the lists decide.
  std::string closed = {};
};

/// The rules in a section of what testparm prints. What lets somebody in with the rights of another ("force user",
/// "admin users" and the like) is not looked at: found is what the user's own rights allow.
ShareUsers SambaUsers(const SmbConf& conf, const std::string& section);

/// Why the rights of the files do not tell who may read a share of Samba's, a sentence without its end; empty when they
/// do. That is so where a module keeps rights of its own, which the kernel does not know.
std::string SambaRightsProblem(const SmbConf& conf, const std::string& section);

/// What is wrong with a name of such a list; empty when nothing is.
std::string UserNameProblem(const std::string& name);

}  // namespace kova::host
