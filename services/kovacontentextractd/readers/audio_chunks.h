#pragma once

#include <taglib/tpropertymap.h>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Whole formats that the tag library does not know. Each tells whether the file is of its format.
/// AU, of Sun: ".snd", then numbers of 4 bytes, high byte first: place of the sound, its size, encoding, rate,
/// channels; then a text, up to the sound.
bool ReadAu(const Source& source, Findings& findings);
/// CAF, of Apple: "caff", version and flags (4 bytes), then chunks with sizes of 8 bytes.
bool ReadCaf(const Source& source, Findings& findings);

/// The texts in chunks of an AIFF file, beside those of its tag, which count more.
void AddAiffTexts(const Source& source, TagLib::PropertyMap& tags);

/// A text whose encoding nothing tells, under the library's name for it; does nothing when the tags have that already.
void AddText(std::string_view name, std::string_view bytes, TagLib::PropertyMap& tags);

}  // namespace ferrox::extract
