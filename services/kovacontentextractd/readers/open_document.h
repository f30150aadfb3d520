#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// OpenDocument texts, sheets, presentations and drawings, and their templates (odt, ods, odp, odg, ott ...): text with
/// notes and comments, values of cells, embedded charts, and properties. Deleted text that a document keeps is left
/// out.
void ReadOpenDocument(const Source& source, Findings& findings);

}  // namespace ferrox::extract
