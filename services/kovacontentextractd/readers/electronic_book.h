#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Books in EPUB.
void ReadElectronicBook(const Source& source, Findings& findings);

}  // namespace ferrox::extract
