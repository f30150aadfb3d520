#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Office files of the years before 2007: DOC, XLS and PPT, and messages that Outlook saved (MSG); which of them it is,
/// the file says.
void ReadOldOffice(const Source& source, Findings& findings);

}  // namespace ferrox::extract
