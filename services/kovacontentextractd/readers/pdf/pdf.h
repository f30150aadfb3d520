#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// PDF, by a library under the GPL.
void ReadPdf(const Source& source, Findings& findings);

/// Loads what the library reads from the disk: the tables of East Asian characters, for documents that name them
/// instead of holding them. To be called while files can still be opened; without it, such text is lost.
void PreparePdf();

}  // namespace ferrox::extract
