#pragma once

#include <string>

#include "common/error.h"

namespace ferrox::cli {

/// How the library's failures are put to people. What went wrong and the remedy follow from the error's code and from
/// what it is about (SubjectError); the reason's text is shown where it is the best there is, and never searched.

/// "<what went wrong>; <the remedy>; <note> (error <code>)", without what is empty. Where the failure comes from a
/// damaged table of shares or list of folders, the place of the damage stands for the first two.
std::string Explain(const Error& error, const std::string& note = "");

/// Why nothing at a share path can be indexed, and what to do: the first of the rules that it breaks (no such folder, a
/// link, a locked share, a recycle bin, another machine's files, a mount, a snapshot). "" when its share is not known.
std::string WhyNotIndexable(const std::string& share_path);

}  // namespace ferrox::cli
