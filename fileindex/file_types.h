#pragma once

#include <string_view>
#include <unordered_map>

#include "fileindex/util.h"

namespace ferrox::fileindex {

/// Every known extension, in lower case and without its dot, and the kind of its files; "" stands for names without
/// one. An extension that is not in it makes FILE_TYPE_OTHER. Built at the first call, which may come from any thread;
/// the keys are views of constants, so that the table may be kept.
const std::unordered_map<std::string_view, FileType>& GetExtensionMap();

}  // namespace ferrox::fileindex
