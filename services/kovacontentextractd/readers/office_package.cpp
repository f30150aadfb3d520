#include "services/kovacontentextractd/readers/office_package.h"

#include <memory>

#include "services/kovacontentextractd/readers/office_open.h"
#include "services/kovacontentextractd/readers/property_fields.h"

namespace ferrox::extract {

namespace {

using Token = XmlTokenizer::Token;

/// Of one part; a sheet with as many links has one for each.
constexpr size_t kRelationsMax = 20000;

std::string_view FolderOf(std::string_view path) {
  const size_t slash = path.rfind('/');
  return slash == std::string_view::npos ? std::string_view() : path.substr(0, slash);
}

/// The member that `target` names as seen from a part in `folder`.
std::string Resolve(std::string_view folder, std::string_view target) {
  if (target.starts_with('/')) return std::string(target.substr(1));
  while (target.starts_with("../")) {
    target.remove_prefix(3);
    folder = FolderOf(folder);
  }
  return folder.empty() ? std::string(target) : std::string(folder) + "/" + std::string(target);
}

/// The member with a part's relations.
std::string RelationsOf(std::string_view part) {
  const std::string_view folder = FolderOf(part);
  const std::string_view name = part.substr(folder.empty() ? 0 : folder.size() + 1);
  return (folder.empty() ? "" : std::string(folder) + "/") + "_rels/" + std::string(name) + ".rels";
}

// docProps/core.xml: Dublin Core and what the authors set.
constexpr PropertyField kCoreFields[] = {
    {"title", field::kKOVAMDTitle},
    {"creator", field::kKOVAMDAuthors, PropertyField::kSemicolonList},
    {"lastModifiedBy", field::kKOVAMDContributors},
    {"keywords", field::kKOVAMDKeywords},
    {"category", field::kKOVAMDKeywords},
    {"description", field::kKOVAMDComment},
    {"subject", field::kKOVAMDDescription},
    {"language", field::kKOVAMDLanguages},
    {"version", field::kKOVAMDVersion},
    {"identifier", field::kKOVAMDIdentifier},
    {"created", field::kKOVAMDContentCreationDate, PropertyField::kTime},
    {"modified", field::kKOVAMDContentModificationDate, PropertyField::kTime},
};

// docProps/app.xml: what the program wrote.
constexpr PropertyField kApplicationFields[] = {
    {"Application", field::kKOVAMDCreator},
    {"Application", field::kKOVAMDEncodingApplications},
    {"Company", field::kKOVAMDOrganizations},
    {"Pages", field::kKOVAMDNumberOfPages, PropertyField::kCount},
    {"Slides", field::kKOVAMDNumberOfPages, PropertyField::kCount},
};

/// What the writer says a picture shows. It may stand in the midst of a word.
void AddDescription(const XmlTokenizer& xml, Findings& findings) {
  const std::string_view description = xml.Attribute("descr");
  if (description.empty()) return;
  findings.Break();
  (void)findings.AddText(description);
  findings.Break();
}

}  // namespace

std::vector<Relation> ReadRelations(ZipContainer& zip, std::string_view part) {
  std::vector<Relation> relations;
  const std::unique_ptr<ByteSource> member = zip.Open(RelationsOf(part));
  if (member == nullptr) return relations;
  XmlTokenizer xml(*member);
  for (Token token; xml.Next(token);) {
    if (token != Token::kOpen || xml.Name() != "Relationship" || relations.size() == kRelationsMax) continue;
    if (xml.Attribute("TargetMode") == "External") continue;
    const std::string_view type = xml.Attribute("Type");
    relations.push_back({std::string(xml.Attribute("Id")), std::string(type.substr(type.rfind('/') + 1)),
                         Resolve(FolderOf(part), xml.Attribute("Target"))});
  }
  return relations;
}

std::map<std::string, std::string> TargetsById(const std::vector<Relation>& relations) {
  std::map<std::string, std::string> targets;
  for (const Relation& relation : relations) targets.emplace(relation.id, relation.target);
  return targets;
}

std::string TargetByType(const std::vector<Relation>& relations, std::string_view type) {
  for (const Relation& relation : relations) {
    if (relation.type == type) return relation.target;
  }
  return {};
}

bool AddParagraphs(ZipContainer& zip, std::string_view part, Findings& findings) {
  const std::unique_ptr<ByteSource> member = zip.Open(part);
  if (member == nullptr) return true;
  XmlTokenizer xml(*member);
  bool in_text = false;
  for (Token token; xml.Next(token);) {
    if (token == Token::kText) {
      if (in_text && !findings.AddText(xml.Text())) return false;
      continue;
    }
    const std::string_view name = xml.Name();
    if (name == "t" || name == "v" || name == "text") {  // names in charts; comments on slides
      in_text = token == Token::kOpen;
      if (!in_text && name != "t") findings.Break();
    } else if (token == Token::kClose) {
      if (name == "p") findings.Break();
    } else if (name == "pPr" || name == "rPr" || name == "Fallback" || name == "numCache") {
      xml.SkipElement();  // tab stops; the same again for programs that know less; a chart's points
    } else if (name == "br" || name == "cr") {
      findings.Break();
    } else if (name == "tab" || name == "noBreakHyphen") {
      (void)findings.AddText(name == "tab" ? "\t" : "-");
    } else if (name == "docPr" || name == "cNvPr") {
      AddDescription(xml, findings);
    }
  }
  findings.Break();
  return true;
}

bool AddRelated(ZipContainer& zip, const std::vector<Relation>& relations,
                std::initializer_list<std::string_view> types, Findings& findings) {
  for (const std::string_view type : types) {
    for (const Relation& relation : relations) {
      if (relation.type == type && !AddParagraphs(zip, relation.target, findings)) return false;
    }
  }
  return true;
}

void AddProperties(ZipContainer& zip, const std::vector<Relation>& relations, Findings& findings) {
  const std::unique_ptr<ByteSource> core = zip.Open(TargetByType(relations, "core-properties"));
  if (core != nullptr) AddPropertyFields(*core, kCoreFields, findings);
  const std::unique_ptr<ByteSource> application = zip.Open(TargetByType(relations, "extended-properties"));
  if (application != nullptr) AddPropertyFields(*application, kApplicationFields, findings);
}

void ReadOfficeOpen(const Source& source, Findings& findings) {
  ZipContainer zip(source, findings);
  if (!zip.IsOpen()) return;
  const std::vector<Relation> relations = ReadRelations(zip, "");
  AddProperties(zip, relations, findings);
  const std::string part = TargetByType(relations, "officeDocument");
  if (part.ends_with("document.xml") || part.starts_with("word/")) {
    ReadWordDocument(zip, part, findings);
  } else if (part.ends_with("workbook.xml") || part.starts_with("xl/")) {
    ReadWorkbook(zip, part, findings);
  } else if (part.ends_with("presentation.xml") || part.starts_with("ppt/")) {
    ReadPresentation(zip, part, findings);
  } else {
    findings.Fail("damaged");
  }
}

}  // namespace ferrox::extract
