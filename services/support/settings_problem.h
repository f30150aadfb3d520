#pragma once

#include <string>

#include "common/error.h"

/// Problems of the settings, in words for people: the library's errors name neither the file nor the remedy.
namespace ferrox::services {

/// What is wrong with the list of indexed folders, which people may have changed by hand: a sentence that names the
/// file, the entry, the member and the remedy. Empty when nothing is.
std::string FoldersFileProblem();

/// A failure of the library in one sentence for people.
std::string Describe(const Error& error);

}  // namespace ferrox::services
