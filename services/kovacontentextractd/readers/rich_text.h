#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Rich Text Format: text in code pages and Unicode, and the document's information.
void ReadRichText(const Source& source, Findings& findings);

}  // namespace ferrox::extract
