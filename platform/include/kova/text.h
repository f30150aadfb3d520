#pragma once

#include "base/text.h"

/// Here for programs that include this path: the functions themselves are base's.
namespace kova {

using base::CharacterBytes;
using base::ControlCodePoint;
using base::WithoutControls;

}  // namespace kova
