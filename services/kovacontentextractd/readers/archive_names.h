#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// The names of what is in an archive: ZIP, TAR (also in gzip, bzip2, xz, zstd and compress), 7z, RAR, cpio. Nothing of
/// it is kept.
void ReadArchiveNames(const Source& source, Findings& findings);

}  // namespace ferrox::extract
