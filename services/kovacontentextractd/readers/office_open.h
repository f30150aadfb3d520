#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Text documents, spreadsheets and presentations in Office Open XML (docx, xlsx, pptx and their macro and template
/// kinds); which of them it is, the file says.
void ReadOfficeOpen(const Source& source, Findings& findings);

}  // namespace ferrox::extract
