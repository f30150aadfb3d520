#pragma once

#include <string>

namespace ferrox::cli {

/// The rule of a share by which a file's name, or that of a folder above it, is kept from those for whom another
/// program asks, as the web's: "hidden by veto files = *.tmp of share photo". On the host itself no such rule holds.
/// "" where none keeps it.
std::string RuleThatHidesName(const std::string& full_path);

/// A line on standard output for such a rule; nothing for "".
void PrintHiding(const std::string& rule);

}  // namespace ferrox::cli
