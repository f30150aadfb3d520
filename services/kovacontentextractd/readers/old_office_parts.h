#pragma once

#include "services/kovacontentextractd/readers/compound_file.h"
#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Title, authors and the like from the file's property sets.
void AddSummaryInformation(const CompoundFile& file, Findings& findings);
/// In which those properties are written.
int SummaryCodePage(const CompoundFile& file);

void ReadOldWord(const CompoundFile& file, Findings& findings);
/// `book` is the stream with the workbook.
void ReadOldExcel(ByteSource& book, Findings& findings);
void ReadOldPowerPoint(const CompoundFile& file, Findings& findings);
void ReadOutlookMessage(const CompoundFile& file, Findings& findings);

}  // namespace ferrox::extract
