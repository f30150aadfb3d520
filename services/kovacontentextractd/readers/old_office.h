#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Office files of the years before 2007: DOC, XLS and PPT, and messages that Outlook saved (MSG). Which of them it is,
/// the streams of the file tell, not its name. Encrypted documents fail with "encrypted", with the properties that are
/// not; of another program's compound file, the properties are all that is read.
void ReadOldOffice(const Source& source, Findings& findings);

}  // namespace ferrox::extract
