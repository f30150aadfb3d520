#pragma once

#include <sys/types.h>

#include <string>

#include "services/support/engine_user.h"

/// What root does for a daemon that is to be a user of its own.
namespace ferrox::services {

/// The ids of an account, by its name or number; of a number without an account, that is its group's, too. `daemon` is
/// who is to have it, for the sentence. @throws Error kInternal for root and for what is nobody.
EngineIds IdsOfAccount(const std::string& user, const char* daemon);

/// Makes the daemon's pid file and gives it away; it lies in a folder where the user can make no file. One of a daemon
/// of root's serves as well. False, with errno, when that fails.
bool GivePidFile(const char* daemon, const EngineIds& to);

/// Makes a folder of that mode and gives it away; one that is there is given, too, but no link is followed. What stands
/// above it must be root's alone. False, with errno, when that fails.
bool GiveOwnFolder(const std::string& path, mode_t mode, const EngineIds& to);

/// Takes on the ids, with no group besides and no capability. Called before there is a thread.
/// @throws Error kInternal.
void BecomeUser(const EngineIds& ids);

}  // namespace ferrox::services
