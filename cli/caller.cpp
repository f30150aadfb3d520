#include "cli/caller.h"

#include <unistd.h>

#include <cerrno>

#include "cli/rights.h"
#include "common/paths.h"
#include "services/support/instance_owner.h"

namespace ferrox::cli {

namespace {

/// A command that needs nothing of the instance is whoever's.
bool NeedsInstance(const Command& command) { return command.needs != Needs::kNothing; }

}  // namespace

bool IsPrivileged() {
  if (geteuid() == 0) return true;
  const std::optional<uid_t> owner = services::InstanceOwner();
  return owner.has_value() ? *owner == geteuid() : errno == ENOENT;
}

bool MayUse(const Command& command) {
  return command.run_for_user != nullptr || !NeedsInstance(command) || IsPrivileged();
}

int RunForUser(const Command& command, const Arguments& arguments) {
  const std::string problem = InstanceRootProblem();
  if (!problem.empty()) throw Failure(problem);
  if (!MayUse(command)) throw MayNot("manage", InstancePath(kConfigurationFolder));
  return command.run_for_user != nullptr ? command.run_for_user(arguments) : command.run(arguments);
}

}  // namespace ferrox::cli
