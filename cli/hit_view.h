#pragma once

#include <json/value.h>

#include "cli/terminal.h"

namespace ferrox::cli {

/// Prints one hit of a search on standard output. Elsewhere than on a terminal: path, title, passage, facts, each on a
/// line, matches in brackets. On one: title or name first, its folder below, the passage wrapped with its matches bold,
/// then the fields that were asked for, as the reply's "asked" names them, and the facts.
void PrintHit(const Json::Value& hit, const Json::Value& asked, const Terminal& terminal);

}  // namespace ferrox::cli
