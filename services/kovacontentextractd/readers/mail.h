#pragma once

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// A message (EML), or a box of many (MBOX): people, subjects, dates, texts, and the names of what is attached.
/// Attached documents are handed on to their own readers; messages within messages are read here, as deep as
/// Limits::nesting. Of a box, people count for the fields of the whole file, subjects are text.
void ReadMail(const Source& source, Findings& findings);

/// Sets the library up. It converts with the C library's converters, which must be loaded while files can be opened.
void PrepareMail();

}  // namespace ferrox::extract
