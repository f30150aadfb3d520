#pragma once

#include <string>

#include "common/error.h"

/// The library tells of settings that it cannot use in its own words, which name neither the file nor the remedy.
namespace ferrox::services {

/// What is wrong with the list of indexed folders, which people may have changed by hand: a sentence that names the
/// file, the entry, the member and the remedy. Empty when nothing is.
std::string FoldersFileProblem();

/// A failure of the library in one sentence for people.
std::string Describe(const Error& error);

}  // namespace ferrox::services
