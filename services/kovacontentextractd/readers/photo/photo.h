#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// What pictures and camera raw files say of themselves (EXIF, IPTC, XMP, comments), by a library under the GPL, in a
/// program of its own. What people wrote (XMP, IPTC) counts more than what a camera put there (EXIF). Of a file larger
/// than MappedFile takes, the beginning is read.
void ReadPhoto(const Source& source, Findings& findings);

/// Sets the library up; reading needs no file.
void PreparePhoto();

}  // namespace ferrox::extract
