#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// PDF, by a library under the GPL, in a program of its own: the text of the pages in reading order, properties, and a
/// packet of XMP. A file larger than MappedFile
/// takes fails, since what a reader needs first stands at its end. Pages beyond 10 s of processor time are cut.
void ReadPdf(const Source& source, Findings& findings);

/// Loads what the library reads from the disk: the tables of East Asian characters, for documents that name them
/// instead of holding them. To be called while files can still be opened; without it, such text is lost.
void PreparePdf();

}  // namespace ferrox::extract
