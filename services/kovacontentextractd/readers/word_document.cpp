#include "services/kovacontentextractd/readers/office_package.h"

namespace ferrox::extract {

/// The text, then what stands beside it: notes, comments, the edges of pages, diagrams, charts, building blocks.
void ReadWordDocument(ZipContainer& zip, const std::string& part, Findings& findings) {
  if (!AddParagraphs(zip, part, findings)) return;
  (void)AddRelated(
      zip, ReadRelations(zip, part),
      {"footnotes", "endnotes", "comments", "header", "footer", "diagramData", "chart", "glossaryDocument"}, findings);
}

}  // namespace ferrox::extract
