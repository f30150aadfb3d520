#pragma once

#include <initializer_list>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovacontentextractd/readers/xml_tokenizer.h"
#include "services/kovacontentextractd/readers/zip_container.h"

/// What the kinds of Office Open XML (ECMA-376) share: parts that point to others by relations, paragraphs, properties.
///
/// A document is a ZIP file of parts. What belongs together is not told by names but by relations: the part "a/b.xml"
/// has its in "a/_rels/b.xml.rels", the container its own in "_rels/.rels". A relation has an id, by which the part's
/// text refers to it, a type (an address that ends in, for example, "/styles") and a target relative to the part's
/// folder. Elements are taken by their names without prefix: all of w:t, a:t and t are text.
namespace ferrox::extract {

struct Relation {
  std::string id;
  std::string type;    ///< the last component of its address, for example "notesSlide"
  std::string target;  ///< the name of the member
};

/// The relations of a part to others in the container; those of the container itself for an empty name.
std::vector<Relation> ReadRelations(ZipContainer& zip, std::string_view part);
/// The members that relations point to, by the relations' ids.
std::map<std::string, std::string> TargetsById(const std::vector<Relation>& relations);
/// The member that the first relation of this type points to; empty when there is none.
std::string TargetByType(const std::vector<Relation>& relations, std::string_view type);

/// Adds the text of a part's paragraphs. False when the findings take no more.
bool AddParagraphs(ZipContainer& zip, std::string_view part, Findings& findings);
/// Adds that of the parts which relations of these types point to, type by type.
bool AddRelated(ZipContainer& zip, const std::vector<Relation>& relations,
                std::initializer_list<std::string_view> types, Findings& findings);

/// Sets title, authors, keywords and the like from the parts that the container names for them.
void AddProperties(ZipContainer& zip, const std::vector<Relation>& relations, Findings& findings);

// The main parts of each kind.
void ReadWordDocument(ZipContainer& zip, const std::string& part, Findings& findings);
void ReadWorkbook(ZipContainer& zip, const std::string& part, Findings& findings);
void ReadPresentation(ZipContainer& zip, const std::string& part, Findings& findings);

}  // namespace ferrox::extract
