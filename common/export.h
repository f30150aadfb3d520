#pragma once

/// Marks what libfileindex.so shows; everything else is hidden.
#define FERROX_EXPORT __attribute__((visibility("default")))
