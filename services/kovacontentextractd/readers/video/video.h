#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Duration, codecs, sizes, rates and tags of films, from the heads and tables of their containers: pictures are not
/// decoded. Its library takes 40 ms to load, so it is to have a worker program of its own.
void ReadVideo(const Source& source, Findings& findings);

/// Sets up what the reader needs; reading needs no file.
void PrepareVideo();

}  // namespace ferrox::extract
