#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// OpenDocument texts, sheets, presentations and drawings, and their templates (odt, ods, odp, odg, ott ...).
void ReadOpenDocument(const Source& source, Findings& findings);

}  // namespace ferrox::extract
