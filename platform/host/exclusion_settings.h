#pragma once

#include <string>
#include <utility>
#include <vector>

#include "base/pattern_lists.h"

namespace kova::host {

/// What is left out everywhere unless the settings say otherwise: names that hold no documents, or keys and passwords,
/// whoever uses them. No name that people give to documents.
const base::PatternLists& DefaultExclusions();

/// Why this instance's settings of exclusions cannot be told, a sentence without its end; "" when they can.
/// `found` are then its patterns, each list with its origin for people, later ones after those that they may take back:
/// the defaults unless they are switched off, and those of kova.json.
std::string InstanceExclusions(std::vector<std::pair<std::string, base::PatternLists>>& found);

}  // namespace kova::host
