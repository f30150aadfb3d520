#pragma once

#include "services/kovacontentextractd/readers/reader.h"

/// Readers of what is text by itself, in whatever encoding (encoding.h). Besides text and title they set
/// "_KOVATextEncoding". Of plain text the first 2 MiB are read, of markup the first 16 MiB; a file that holds something
/// else than text fails with "not text".
namespace ferrox::extract {

void ReadPlainFile(const Source& source, Findings& findings);
void ReadHtmlFile(const Source& source, Findings& findings);
void ReadXmlFile(const Source& source, Findings& findings);
/// A file whose name and first bytes tell nothing: plain text, or at least its "KOVAMDContentType".
void ReadUnknownFile(const Source& source, Findings& findings);

/// Loads what these readers need from the disk.
void PrepareTextReaders();

}  // namespace ferrox::extract
