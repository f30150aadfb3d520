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
  for (Token token; xml.Next(token);) {
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

/// Collects the text of paragraphs, with a row of a table in a line.
class ContentReader {
 public:
  ContentReader(ByteSource& content, Findings& findings) : xml_(content), findings_(findings) {}

  void Read() {
    for (Token token; xml_.Next(token);) {
      if (token == Token::kText) {
        if (paragraphs_ > 0 && !findings_.AddText(xml_.Text())) return;
      } else if (token == Token::kOpen) {
        Open(xml_.Name());
      } else {
        Close(xml_.Name());
      }
    }
  }

 private:
  static bool IsParagraph(std::string_view name) { return name == "p" || name == "h"; }

  void Open(std::string_view name) {
    if (IsParagraph(name)) {
      if (paragraphs_++ > 0) findings_.Break();
    } else if (name == "automatic-styles" || name == "tracked-changes" || name == "binary-data") {
      xml_.SkipElement();
    } else if (name == "table") {
      (void)findings_.AddText(xml_.PrefixedAttribute("name"));
      findings_.Break();
    } else if (name == "table-cell") {
      ++cells_;
    } else if (paragraphs_ > 0) {
      AddBlank(name, findings_);
    }
  }

  void Close(std::string_view name) {
    if (IsParagraph(name)) {
      --paragraphs_;
      if (cells_ > 0 && paragraphs_ == 0) {
        (void)findings_.AddText("\t");
      } else {
        findings_.Break();
      }
    } else if (name == "table-cell") {
      --cells_;
    } else if (name == "table-row") {
      findings_.Break();
    }
  }

  XmlTokenizer xml_;
  Findings& findings_;
  int paragraphs_ = 0;  ///< a paragraph may hold others: notes, text in drawings
  int cells_ = 0;
};

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
  ContentReader(*content, findings).Read();
}

}  // namespace ferrox::extract
