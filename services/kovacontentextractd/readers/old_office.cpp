#include "services/kovacontentextractd/readers/old_office.h"

#include "services/kovacontentextractd/readers/old_office_parts.h"

namespace ferrox::extract {

void ReadOldOffice(const Source& source, Findings& findings) {
  const CompoundFile file(source);
  if (!file.IsOpen()) {
    FileSource bare(source);  // a workbook from before there were compound files, or damaged
    return ReadOldExcel(bare, findings);
  }
  AddSummaryInformation(file, findings);
  if (file.Open("WordDocument") != nullptr) return ReadOldWord(file, findings);
  for (const char* name : {"Workbook", "Book"}) {
    if (const auto book = file.Open(name)) return ReadOldExcel(*book, findings);
  }
  if (file.Open("PowerPoint Document") != nullptr) return ReadOldPowerPoint(file, findings);
  if (file.Open("EncryptedPackage") != nullptr) return findings.Fail("encrypted");  // around a newer document
  if (file.Open("__properties_version1.0") != nullptr) return ReadOutlookMessage(file, findings);
  // Another program's file: its properties may be all that can be had.
}

}  // namespace ferrox::extract
