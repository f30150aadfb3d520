#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// What pictures and camera raw files say of themselves (EXIF, IPTC, XMP), by a library under the GPL.
void ReadPhoto(const Source& source, Findings& findings);

/// Sets the library up; reading needs no file.
void PreparePhoto();

}  // namespace ferrox::extract
