#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Text documents, spreadsheets and presentations in Office Open XML (docx, xlsx, pptx and their macro and template
/// kinds). Which of them it is, the file says; one whose main part is of no known kind fails with "damaged".
void ReadOfficeOpen(const Source& source, Findings& findings);

}  // namespace ferrox::extract
