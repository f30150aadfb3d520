#pragma once

/// The installed path of this header, which stays; the declarations are in the room of their module.
#include "fileindex/folders/folder.h"
