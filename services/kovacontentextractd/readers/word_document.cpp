#include "services/kovacontentextractd/readers/office_package.h"

namespace ferrox::extract {

void ReadWordDocument(ZipContainer& zip, const std::string& part, Findings& findings) {
  if (!AddParagraphs(zip, part, findings)) return;
  static constexpr std::string_view kBeside[] = {"footnotes", "endnotes",    "comments",        "header",
                                                 "footer",    "diagramData", "glossaryDocument"};
  const std::vector<Relation> relations = ReadRelations(zip, part);
  for (const std::string_view type : kBeside) {
    for (const Relation& relation : relations) {
      if (relation.type == type && !AddParagraphs(zip, relation.target, findings)) return;
    }
  }
}

}  // namespace ferrox::extract
