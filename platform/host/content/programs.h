#pragma once

#include <kova/content_type.h>

namespace kova::content {

/// Whether a program of readers is there now. Where not even their folder can be told, they count as there.
bool IsInstalled(Program program);

}  // namespace kova::content
