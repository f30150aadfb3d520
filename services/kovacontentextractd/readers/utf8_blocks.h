#pragma once

#include <cstddef>

namespace ferrox::extract {

/// How many bytes at the beginning are certainly valid UTF-8 and end at a character's border, found 16 bytes at a time:
/// all but a few when all are. 0 on a processor that cannot.
size_t ValidUtf8Blocks(const unsigned char* bytes, size_t size);

}  // namespace ferrox::extract
