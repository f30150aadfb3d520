#pragma once

#include <taglib/tpropertymap.h>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Sets the fields for the tags of a sound, which have the names that the library gives them in all formats. Lyrics are
/// the file's text. Texts that are UTF-8 or a legacy encoding behind a tag that says Latin-1 are put right.
void AddTags(const TagLib::PropertyMap& tags, Findings& findings);

}  // namespace ferrox::extract
