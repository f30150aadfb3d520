#pragma once

#include <string>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Sets fields from a packet of XMP, as documents hold one beside their own properties.
void AddXmpPacket(const std::string& packet, Findings& findings);

}  // namespace ferrox::extract
