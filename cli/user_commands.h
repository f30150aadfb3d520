#pragma once

#include "cli/command.h"

/// What commands do for ordinary users: all that they show comes from the engine, which tells each user what that user
/// may read (docs/formats/engine.md, Ordinary users). Of files of the service nothing is read.
namespace ferrox::cli {

/// With --as, for root and the instance's owner: what that user would find and see, and of a file why not.
int RunUserSearch(const Arguments& arguments);
int RunUserShow(const Arguments& arguments);
int RunUserStatus(const Arguments& arguments);

}  // namespace ferrox::cli
