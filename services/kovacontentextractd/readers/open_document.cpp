#include "services/kovacontentextractd/readers/open_document.h"

#include <memory>

#include "services/kovacontentextractd/readers/property_fields.h"
#include "services/kovacontentextractd/readers/times.h"
#include "services/kovacontentextractd/readers/xml_tokenizer.h"
#include "services/kovacontentextractd/readers/zip_container.h"

namespace ferrox::extract {

namespace {

using Token = XmlTokenizer::Token;

constexpr PropertyField kMetaFields[] = {
    {"title", "KOVAMDTitle"},
    {"initial-creator", "KOVAMDAuthors"},
    {"creator", "KOVAMDContributors"},
    {"keyword", "KOVAMDKeywords"},
    {"description", "KOVAMDComment"},
    {"subject", "KOVAMDDescription"},
    {"language", "KOVAMDLanguages"},
    {"generator", "KOVAMDCreator"},
    {"generator", "KOVAMDEncodingApplications"},
    {"creation-date", "KOVAMDContentCreationDate", PropertyField::kTime},
    {"date", "KOVAMDContentModificationDate", PropertyField::kTime},
};

/// The number of pages stands in an attribute.
void AddPageCount(ByteSource& meta, Findings& findings) {
  XmlTokenizer xml(meta);
  for (Token token = xml.Next(); token != Token::kEnd && token != Token::kBad; token = xml.Next()) {
    if (token != Token::kOpen || xml.Name() != "document-statistic") continue;
    SetProperty({"", "KOVAMDNumberOfPages", PropertyField::kCount}, xml.PrefixedAttribute("page-count"), findings);
  }
}

/// What an element within a paragraph stands for: blanks that XML would not keep, tabs, line ends.
void AddBlank(std::string_view name, Findings& findings) {
  if (name == "s") (void)findings.AddText(" ");
  if (name == "tab") (void)findings.AddText("\t");
  if (name == "line-break") findings.Break();
}

void AddContent(ByteSource& content, Findings& findings) {
  XmlTokenizer xml(content);
  int paragraphs = 0;  // a paragraph may hold others: notes, text in drawings
  for (Token token = xml.Next(); token != Token::kEnd && token != Token::kBad; token = xml.Next()) {
    if (token == Token::kText) {
      if (paragraphs > 0 && !findings.AddText(xml.Text())) return;
      continue;
    }
    const std::string_view name = xml.Name();
    if (name == "p" || name == "h") {
      paragraphs += token == Token::kOpen ? 1 : -1;
      findings.Break();
    } else if (token == Token::kOpen) {
      if (name == "automatic-styles" || name == "tracked-changes" || name == "binary-data") {
        xml.SkipElement();
      } else if (name == "table") {
        (void)findings.AddText(xml.PrefixedAttribute("name"));
        findings.Break();
      } else if (paragraphs > 0) {
        AddBlank(name, findings);
      }
    }
  }
}

}  // namespace

void ReadOpenDocument(const Source& source, Findings& findings) {
  ZipContainer zip(source, findings);
  if (!zip.IsOpen()) return;
  if (const auto meta = zip.Open("meta.xml")) AddPropertyFields(*meta, kMetaFields, findings);
  if (const auto meta = zip.Open("meta.xml")) AddPageCount(*meta, findings);
  // An encrypted document says so in its manifest: its members look like noise otherwise.
  if (zip.ReadMember("META-INF/manifest.xml", 1U << 20).find("encryption-data") != std::string::npos) {
    return findings.Fail("encrypted");
  }
  const std::unique_ptr<ByteSource> content = zip.Open("content.xml");
  if (content == nullptr) return findings.Fail("damaged");
  AddContent(*content, findings);
}

}  // namespace ferrox::extract
