#include "services/kovacontentextractd/readers/open_document.h"

#include <algorithm>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

#include "services/kovacontentextractd/readers/property_fields.h"
#include "services/kovacontentextractd/readers/times.h"
#include "services/kovacontentextractd/readers/xml_tokenizer.h"
#include "services/kovacontentextractd/readers/zip_container.h"

namespace ferrox::extract {

namespace {

using Token = XmlTokenizer::Token;

// OpenDocument (ISO 26300) is a ZIP file with content.xml (the text, sheets or slides), styles.xml (headers and
// footers), meta.xml (properties) and META-INF/manifest.xml (which members there are, and whether they are encrypted).
// Embedded objects are folders with a content.xml of their own.

constexpr PropertyField kMetaFields[] = {
    {"title", field::kKOVAMDTitle},
    {"initial-creator", field::kKOVAMDAuthors},
    {"creator", field::kKOVAMDContributors},
    {"keyword", field::kKOVAMDKeywords},
    {"description", field::kKOVAMDComment},
    {"subject", field::kKOVAMDDescription},
    {"language", field::kKOVAMDLanguages},
    {"generator", field::kKOVAMDCreator},
    {"generator", field::kKOVAMDEncodingApplications},
    {"creation-date", field::kKOVAMDContentCreationDate, PropertyField::kTime},
    {"date", field::kKOVAMDContentModificationDate, PropertyField::kTime},
};

/// The number of pages stands in an attribute.
void AddPageCount(ByteSource& meta, Findings& findings) {
  XmlTokenizer xml(meta);
  for (Token token; xml.Next(token);) {
    if (token != Token::kOpen || xml.Name() != "document-statistic") continue;
    SetProperty({"", field::kKOVAMDNumberOfPages, PropertyField::kCount}, xml.PrefixedAttribute("page-count"),
                findings);
  }
}

/// What an element within a paragraph stands for: blanks that XML would not keep, tabs, line ends.
void AddBlank(std::string_view name, Findings& findings) {
  if (name == "s") (void)findings.AddText(" ");
  if (name == "tab") (void)findings.AddText("\t");
  if (name == "line-break") findings.Break();
}

/// Paragraphs and headings.
bool IsParagraph(std::string_view name) { return name == "p" || name == "h"; }

/// Stands in the midst of a paragraph, even of a word, and is not of it: notes and their marks, comments with their
/// authors, how to pronounce a word, the name of a picture.
bool IsAside(std::string_view name) {
  static constexpr std::string_view kAsides[] = {"note",      "note-citation", "annotation", "creator",    "date",
                                                 "ruby-text", "title",         "desc",       "date-string"};
  return std::find(std::begin(kAsides), std::end(kAsides), name) != std::end(kAsides);
}

/// Text that no paragraph is around: what a slide shows at its edges, the names of pictures.
bool IsBare(std::string_view name) {
  return name == "footer-decl" || name == "header-decl" || name == "title" || name == "desc";
}

/// Headers and footers, of the first page, of left ones and of all.
bool IsPageEdge(std::string_view name) { return name.starts_with("header") || name.starts_with("footer"); }

/// Collects the text of paragraphs, with a row of a table in a line: of a whole part, or of the headers and footers in
/// it.
class ContentReader {
 public:
  enum Part { kAll, kPageEdges };
  ContentReader(ByteSource& content, Part part, Findings& findings)
      : xml_(content), findings_(findings), wanted_(part == kAll ? 1 : 0) {}

  void Read() {
    for (Token token; xml_.Next(token);) {
      if (token == Token::kText) {
        if (paragraphs_ > 0 && wanted_ > 0 && !findings_.AddText(xml_.Text())) return;
      } else if (token == Token::kOpen) {
        Open(xml_.Name());
      } else {
        Close(xml_.Name());
      }
    }
  }

  /// The members of the objects that the text embeds, for example charts.
  const std::vector<std::string>& Objects() const { return objects_; }

 private:
  static constexpr size_t kObjectsMax = 1000;

  /// An element begins.
  void Open(std::string_view name) {
    if (IsPageEdge(name)) ++wanted_;
    if (IsParagraph(name) || IsBare(name)) {
      if (paragraphs_++ > 0) findings_.Break();
    } else if (name == "automatic-styles" || name == "tracked-changes" || name == "binary-data") {
      xml_.SkipElement();
    } else if (name == "table") {
      (void)findings_.AddText(xml_.PrefixedAttribute("name"));
      findings_.Break();
    } else if (name == "table-cell") {
      ++cells_;
      NoteValue();
    } else if (name == "object") {
      AddObject(xml_.PrefixedAttribute("href"));
    } else if (paragraphs_ > 0) {
      IsAside(name) ? findings_.Break() : AddBlank(name, findings_);
    }
  }

  /// It ends. A paragraph within a cell ends with a tab, others with a line.
  void Close(std::string_view name) {
    if (IsPageEdge(name)) --wanted_;
    if (IsParagraph(name) || IsBare(name)) {
      --paragraphs_;
      if (cells_ > 0 && paragraphs_ == 0) {
        (void)findings_.AddText("\t");
      } else {
        findings_.Break();
      }
    } else if (name == "table-cell") {
      --cells_;
      AddValue();
    } else if (name == "table-row" || (paragraphs_ > 0 && IsAside(name))) {
      findings_.Break();
    }
  }

  /// A sheet's cell has its number or date twice, as it is and as it is shown.
  void NoteValue() {
    value_ = xml_.PrefixedAttribute(xml_.PrefixedAttribute("value-type") == "date" ? "date-value" : "value");
    value_.resize(std::min(value_.find("T00:00:00"), value_.size()));
    cell_begin_ = findings_.Text().size();
  }

  void AddValue() {
    const bool is_new = !value_.empty() && findings_.Text().find(value_, cell_begin_) == std::string::npos;
    if (is_new && findings_.AddText(value_)) (void)findings_.AddText("\t");
    value_.clear();
  }

  /// Notes an object for later: its text comes behind that of the document.
  void AddObject(std::string_view address) {
    if (address.starts_with("./")) address.remove_prefix(2);
    if (!address.empty() && objects_.size() < kObjectsMax) objects_.push_back(std::string(address) + "/content.xml");
  }

  XmlTokenizer xml_;
  Findings& findings_;
  std::vector<std::string> objects_;
  int wanted_;          ///< more than 0 where text is taken
  int paragraphs_ = 0;  ///< a paragraph may hold others: notes, text in drawings
  int cells_ = 0;
  std::string value_;  ///< of the present cell
  size_t cell_begin_ = 0;
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
  ContentReader reader(*content, ContentReader::kAll, findings);
  reader.Read();
  for (const std::string& object : reader.Objects()) {
    if (const auto chart = zip.Open(object)) ContentReader(*chart, ContentReader::kAll, findings).Read();
  }
  // The headers and footers of sheets and slides are mostly what the program put there.
  const bool is_text = zip.ReadMember("mimetype", 100).find(".text") != std::string::npos;
  if (const auto styles = is_text ? zip.Open("styles.xml") : nullptr) {
    ContentReader(*styles, ContentReader::kPageEdges, findings).Read();
  }
}

}  // namespace ferrox::extract
