#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Rich Text Format: text in code pages and Unicode, with notes and text in drawings, and the document's information
/// (title, authors, keywords). Instructions of fields, pictures and embedded objects are passed over. A file that takes
/// too much processor time is cut.
void ReadRichText(const Source& source, Findings& findings);

}  // namespace ferrox::extract
