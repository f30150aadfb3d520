#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// The names of what is in an archive: ZIP, TAR (also in gzip, bzip2, xz, zstd and compress), 7z, RAR, cpio. Of a
/// single packed file, its text.
void ReadArchive(const Source& source, Findings& findings);

/// Loads what turns names into UTF-8, while files can still be opened; without it, some names are lost.
void PrepareArchive();

}  // namespace ferrox::extract
