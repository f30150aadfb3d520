#pragma once

#include <cstdint>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// How much of a file of mail can be given to a library that keeps each header and each part in memory: up to where one
/// message has more of them than any real one.
uint64_t MailExtent(const Source& source, bool is_box);

}  // namespace ferrox::extract
