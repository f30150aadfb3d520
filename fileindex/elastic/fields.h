#pragma once

/// The installed path of this header, which stays; the names are said to the engine, and so are wire's.
#include "wire/fields.h"
