#pragma once

#include <string>

#include "cli/command.h"

/// What the words of the usage lines ("SHARE", "NEW_NAME") stand for, for help and for messages about a missing one.
namespace ferrox::cli {

/// In one line: "the name of a share; 'fileindexctl share list' shows them". "" for a word that needs no explanation.
std::string MeaningOf(const Command& command, const std::string& word);

/// A command line that works where such a share and such files are: "fileindexctl share rename photo pictures".
std::string ExampleOf(const Command& command);

/// "SHARE" of "[SHARE...]".
std::string PlainWord(std::string word);

}  // namespace ferrox::cli
