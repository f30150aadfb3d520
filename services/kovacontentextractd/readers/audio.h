#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Tags and properties of music and other sound: MP3, FLAC, Ogg, Opus, M4A, WAV, AIFF, APE, WMA, DSF, AU, CAF and more.
/// Sound itself is not decoded: a length that no head tells is the library's estimate.
void ReadAudio(const Source& source, Findings& findings);

/// Sets up what the reader needs; reading needs no file.
void PrepareAudio();

}  // namespace ferrox::extract
