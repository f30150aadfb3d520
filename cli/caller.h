#pragma once

#include "cli/command.h"

/// Who runs the tool. Root and the owner of the instance steer it, and read its settings and files. Everybody else is
/// an ordinary user: for them the tool reads no file of the service, and sends what they ask to the search engine,
/// which knows from the kernel who asks.
namespace ferrox::cli {

/// Whether root or the owner of the instance's root folder calls. A folder that is not there yet will be the caller's.
bool IsPrivileged();

/// Whether the calling user may use the command at all.
bool MayUse(const Command& command);

/// Runs the command for an ordinary user. @throws NotPermitted when it is not for them; what the command throws.
int RunForUser(const Command& command, const Arguments& arguments);

}  // namespace ferrox::cli
