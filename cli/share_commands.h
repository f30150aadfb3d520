#pragma once

#include <vector>

#include "cli/command.h"

/// The rows of the table of commands (command_table.h) for shares, and for what happens on the host.
namespace ferrox::cli {

std::vector<Command> ShareCommands();
std::vector<Command> HostEventCommands();

}  // namespace ferrox::cli
