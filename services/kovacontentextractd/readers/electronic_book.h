#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Books in EPUB: properties, and the text of the chapters in reading order.
void ReadElectronicBook(const Source& source, Findings& findings);

}  // namespace ferrox::extract
