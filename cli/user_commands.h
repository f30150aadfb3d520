#pragma once

#include "cli/command.h"

/// What commands do for ordinary users: all that they show comes from the engine, which tells each user what that user
/// may read (docs/formats/engine.md, Ordinary users). Of files of the service nothing is read.
namespace ferrox::cli {

/// Also for "search --as USER" of root and the instance's owner.
int RunUserSearch(const Arguments& arguments);
int RunUserShow(const Arguments& arguments);
int RunUserStatus(const Arguments& arguments);

}  // namespace ferrox::cli
