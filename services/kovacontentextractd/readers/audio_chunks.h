#pragma once

#include <taglib/tpropertymap.h>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Whole formats that the tag library does not know. Each tells whether the file is of its format.
bool ReadAu(const Source& source, Findings& findings);
bool ReadCaf(const Source& source, Findings& findings);

/// The texts in chunks of an AIFF file, beside those of its tag, which count more.
void AddAiffTexts(const Source& source, TagLib::PropertyMap& tags);

/// A text whose encoding nothing tells, under the library's name for it; does nothing when the tags have that already.
void AddText(std::string_view name, std::string_view bytes, TagLib::PropertyMap& tags);

}  // namespace ferrox::extract
