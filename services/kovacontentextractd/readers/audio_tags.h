#pragma once

#include <taglib/tpropertymap.h>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// What the tags of a sound say, by the names that the library has for them.
void AddTags(const TagLib::PropertyMap& tags, Findings& findings);

}  // namespace ferrox::extract
