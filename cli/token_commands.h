#pragma once

#include "cli/command_table.h"

namespace ferrox::cli {

/// Tokens for searching by HTTP (command_token.cpp), which every user of the host may have.
CommandGroup TokenCommands();

}  // namespace ferrox::cli
