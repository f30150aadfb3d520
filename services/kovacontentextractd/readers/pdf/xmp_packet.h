#pragma once

#include <string>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Sets fields from a packet of XMP (ISO 16684), as documents hold one beside their own properties: the elements of
/// Dublin Core, whose values are lists in RDF. Properties that are written as attributes are not read.
void AddXmpPacket(const std::string& packet, Findings& findings);

}  // namespace ferrox::extract
