#pragma once

#include <string>

#include "common/error.h"

namespace ferrox::cli {

/// "<what went wrong>; <the remedy>; <note> (error <code>)", without what is empty.
std::string Explain(const Error& error, const std::string& note = "");

/// Why nothing at a share path can be indexed, and what to do, as far as that can be told.
std::string WhyNotIndexable(const std::string& share_path);

}  // namespace ferrox::cli
