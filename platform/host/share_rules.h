#pragma once

#include <string>

#include "platform/host/share_table.h"

namespace kova::host {

/// What a share may be called and where it may lie; each answer is a sentence for people, with the remedy.
/// What is wrong with a share's name and path as texts, whether or not the folder exists; empty when nothing is.
std::string ShareTextProblem(const std::string& name, const std::string& path);

/// What is wrong with the share's folder on disk; empty when nothing is.
std::string ShareFolderProblem(const ShareEntry& share);

}  // namespace kova::host
