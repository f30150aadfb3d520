#include <memory>

#include "services/kovacontentextractd/readers/office_package.h"

namespace ferrox::extract {

namespace {

using Token = XmlTokenizer::Token;

// The main part lists the slides by the ids of their relations; each slide is a part with paragraphs, which has
// relations to its notes, comments, diagrams and charts.

constexpr size_t kSlidesMax = 20000;

/// The ids of the slides' relations, in the order in which they are shown.
std::vector<std::string> SlideIds(ZipContainer& zip, const std::string& part) {
  std::vector<std::string> ids;
  const std::unique_ptr<ByteSource> member = zip.Open(part);
  if (member == nullptr) return ids;
  XmlTokenizer xml(*member);
  for (Token token; xml.Next(token);) {
    if (token != Token::kOpen || xml.Name() != "sldId" || ids.size() == kSlidesMax) continue;
    const std::string_view id = xml.PrefixedAttribute("id");
    if (!id.empty()) ids.emplace_back(id);  // sections list the same slides again, by numbers
  }
  return ids;
}

}  // namespace

/// Slide by slide, each with what belongs to it. Masters and layouts hold the program's words, and are not read.
void ReadPresentation(ZipContainer& zip, const std::string& part, Findings& findings) {
  const std::vector<Relation> relations = ReadRelations(zip, part);
  const std::vector<std::string> ids = SlideIds(zip, part);
  if (!ids.empty()) findings.SetInteger(field::kKOVAMDNumberOfPages, static_cast<int64_t>(ids.size()));
  std::map<std::string, std::string> targets = TargetsById(relations);
  for (const std::string& id : ids) {
    const std::string& slide = targets[id];
    if (slide.empty()) continue;
    if (!AddParagraphs(zip, slide, findings)) return;
    if (!AddRelated(zip, ReadRelations(zip, slide), {"notesSlide", "comments", "diagramData", "chart"}, findings))
      return;
  }
}

}  // namespace ferrox::extract
