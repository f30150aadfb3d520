#include "services/kovacontentextractd/readers/electronic_book.h"

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "services/kovacontentextractd/readers/markup.h"
#include "services/kovacontentextractd/readers/property_fields.h"
#include "services/kovacontentextractd/readers/xml_tokenizer.h"
#include "services/kovacontentextractd/readers/zip_container.h"

namespace ferrox::extract {

namespace {

using Token = XmlTokenizer::Token;

// EPUB is a ZIP file. META-INF/container.xml names the package, an XML file (OPF) with properties, the list of all
// parts (item: id, href) and the order in which they are read (itemref: idref). The parts are HTML, relative to the
// package.

constexpr size_t kPartsMax = 20000;
/// Of one chapter, what is read.
constexpr size_t kChapterMaxBytes = 4U << 20;

constexpr PropertyField kPackageFields[] = {
    {"title", field::kKOVAMDTitle},
    {"creator", field::kKOVAMDAuthors},
    {"contributor", field::kKOVAMDContributors},
    {"publisher", field::kKOVAMDPublishers},
    {"language", field::kKOVAMDLanguages},
    {"subject", field::kKOVAMDKeywords},
    {"description", field::kKOVAMDDescription},
    {"rights", field::kKOVAMDRights},
    {"identifier", field::kKOVAMDIdentifier},
    {"date", field::kKOVAMDContentCreationDate, PropertyField::kTime},
};

/// The member that describes the book. The container may be packed with its folder, and then is not where it must be.
std::string PackageName(ZipContainer& zip) {
  if (const std::unique_ptr<ByteSource> container = zip.Open("META-INF/container.xml")) {
    XmlTokenizer xml(*container);
    for (Token token; xml.Next(token);) {
      if (token == Token::kOpen && xml.Name() == "rootfile") return std::string(xml.Attribute("full-path"));
    }
  }
  const std::vector<std::string> names = zip.Names("", ".opf", 1);
  return names.empty() ? std::string() : names.front();
}

/// An address in the package's description is a member's name with some characters as "%20".
std::string Unescaped(std::string_view address) {
  std::string name;
  const auto digit = [](char c) {
    return c >= '0' && c <= '9' ? c - '0' : (c | 0x20) >= 'a' && (c | 0x20) <= 'f' ? (c | 0x20) - 'a' + 10 : -1;
  };
  for (size_t i = 0; i < address.size(); ++i) {
    const bool escaped =
        address[i] == '%' && i + 2 < address.size() && digit(address[i + 1]) >= 0 && digit(address[i + 2]) >= 0;
    name += escaped ? static_cast<char>(digit(address[i + 1]) * 16 + digit(address[i + 2])) : address[i];
    if (escaped) i += 2;
  }
  return name;
}

/// The chapters' members, in reading order.
std::vector<std::string> Chapters(ByteSource& package, const std::string& folder) {
  std::map<std::string, std::string> parts;
  std::vector<std::string> chapters;
  XmlTokenizer xml(package);
  for (Token token; xml.Next(token);) {
    if (token != Token::kOpen) continue;
    if (xml.Name() == "item" && parts.size() < kPartsMax) {
      parts[std::string(xml.Attribute("id"))] = folder + Unescaped(xml.Attribute("href"));
    } else if (xml.Name() == "itemref" && chapters.size() < kPartsMax) {
      const auto part = parts.find(std::string(xml.Attribute("idref")));
      if (part != parts.end()) chapters.push_back(part->second);
    }
  }
  return chapters;
}

}  // namespace

/// The package is read twice, for properties and for chapters: it is small, and neither needs the whole of it in
/// memory.
void ReadElectronicBook(const Source& source, Findings& findings) {
  ZipContainer zip(source, findings);
  if (!zip.IsOpen()) return;
  const std::string name = PackageName(zip);
  const std::string folder = name.substr(0, name.find('/') == std::string::npos ? 0 : name.rfind('/') + 1);
  std::unique_ptr<ByteSource> package = zip.Open(name);
  if (package == nullptr) return findings.Fail("damaged");
  AddPropertyFields(*package, kPackageFields, findings);
  package = zip.Open(name);
  if (package == nullptr) return;
  for (const std::string& chapter : Chapters(*package, folder)) {
    const std::string html = zip.ReadMember(chapter, kChapterMaxBytes);
    if (!findings.AddText(ReadHtml(html, findings.Bounds().text_bytes).text)) return;
    findings.Break();
  }
}

}  // namespace ferrox::extract
