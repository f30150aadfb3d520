#pragma once

#include <string_view>
#include <unordered_map>

#include "fileindex/util.h"

namespace ferrox::fileindex {

/// Every known extension, in lower case and without its dot, and the kind of its files.
const std::unordered_map<std::string_view, FileType>& GetExtensionMap();

}  // namespace ferrox::fileindex
