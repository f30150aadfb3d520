#pragma once

#include "services/kovacontentextractd/readers/compound_file.h"
#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

// What ReadOldOffice chooses from by the streams of a compound file. Each reader takes the file as far as it goes, and
// says in the findings what stopped it.

/// Title, authors and the like from the file's property sets.
void AddSummaryInformation(const CompoundFile& file, Findings& findings);
/// The code page that the texts of those properties are in; 1252 when there are none.
int SummaryCodePage(const CompoundFile& file);

/// Word 6 to 2003; the stream "WordDocument" must be there.
void ReadOldWord(const CompoundFile& file, Findings& findings);
/// Excel 2 to 2003. `book` is the stream with the workbook, or a whole file from before there were compound files.
void ReadOldExcel(ByteSource& book, Findings& findings);
/// PowerPoint 97 to 2003; the stream "PowerPoint Document" must be there.
void ReadOldPowerPoint(const CompoundFile& file, Findings& findings);
/// A message as Outlook saves it.
void ReadOutlookMessage(const CompoundFile& file, Findings& findings);

}  // namespace ferrox::extract
