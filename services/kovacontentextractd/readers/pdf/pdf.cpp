#include "services/kovacontentextractd/readers/pdf/pdf.h"

#include <algorithm>
#include <exception>
#include <memory>
#include <new>
#include <poppler-document.h>
#include <poppler-global.h>
#include <poppler-page.h>
#include <string>
#include <string_view>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/converters.h"
#include "services/kovacontentextractd/readers/cpu_budget.h"
#include "services/kovacontentextractd/readers/mapped_file.h"
#include "services/kovacontentextractd/readers/pdf/character_tables.h"
#include "services/kovacontentextractd/readers/pdf/xmp_packet.h"
#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

using Document = std::unique_ptr<poppler::document>;

void IgnoreComplaint(const std::string&, void*) {}

/// The library's strings are units of UTF-16.
std::string Utf8(const poppler::ustring& text) {
  std::string bytes;
  for (const uint16_t unit : text) {
    bytes += static_cast<char>(unit);
    bytes += static_cast<char>(unit >> 8);
  }
  return FromUtf16Little(bytes);
}

/// The library widens each byte of a packet without looking at its encoding.
std::string Packet(const poppler::ustring& widened) {
  std::string bytes;
  for (const uint16_t unit : widened) bytes += static_cast<char>(unit);
  return bytes;
}

/// A time as PDF writes it, "D:20240301120000+01'00'". The library's own functions return a type whose size is another
/// one in the library than here on some processors.
void AddTime(const char* field, std::string text, Findings& findings) {
  if (text.starts_with("D:")) text.erase(0, 2);
  const size_t digits = std::min(text.find_first_not_of("0123456789"), text.size());
  std::string time = text.substr(0, std::min<size_t>(digits, 4));
  constexpr char kBetween[] = "--T::";
  for (size_t part = 0; part < 5 && 4 + part * 2 + 2 <= digits; ++part) {
    time += kBetween[part] + text.substr(4 + part * 2, 2);
  }
  std::string zone = text.substr(digits);
  std::replace(zone.begin(), zone.end(), '\'', ':');
  if (const auto seconds = ParseTime(time + zone)) findings.SetInteger(field, *seconds);
}

/// The document's own properties count more than those of its packet of XMP, which is read first.
void AddInformation(const poppler::document& document, Findings& findings) {
  AddXmpPacket(Packet(document.metadata()), findings);
  findings.Set(field::kKOVAMDTitle, Utf8(document.get_title()));
  findings.Set(field::kKOVAMDAuthors, Utf8(document.get_author()));
  findings.Set(field::kKOVAMDDescription, Utf8(document.get_subject()));
  findings.Set(field::kKOVAMDKeywords, Utf8(document.get_keywords()));
  findings.Set(field::kKOVAMDCreator, Utf8(document.get_creator()));
  findings.Set(field::kKOVAMDEncodingApplications, Utf8(document.get_producer()));
  AddTime(field::kKOVAMDContentCreationDate, Utf8(document.info_key("CreationDate")), findings);
  AddTime(field::kKOVAMDContentModificationDate, Utf8(document.info_key("ModDate")), findings);
  findings.SetInteger(field::kKOVAMDNumberOfPages, document.pages());
  int major = 0, minor = 0;
  document.get_pdf_version(&major, &minor);
  findings.Set(field::kKOVAMDVersion, std::to_string(major) + "." + std::to_string(minor));
  if (document.is_encrypted()) findings.Set(field::kKOVAMDSecurityMethod, "Password Encrypted");
}

/// The text of all pages, and the size of the first one in points.
void AddPages(const poppler::document& document, Findings& findings) {
  constexpr std::chrono::milliseconds kCpuMax(10000);
  const CpuBudget budget(kCpuMax);
  for (int i = 0; i < document.pages(); ++i) {
    if (budget.IsSpent()) return findings.MarkCut();
    const std::unique_ptr<poppler::page> page(document.create_page(i));
    if (page == nullptr) {
      findings.Fail("damaged");
      continue;
    }
    if (i == 0) {
      const poppler::rectf size = page->page_rect();
      findings.SetNumber(field::kKOVAMDPageWidth, size.width());
      findings.SetNumber(field::kKOVAMDPageHeight, size.height());
    }
    if (!findings.AddText(Utf8(page->text({}, poppler::page::non_raw_non_physical_layout)))) return;
    findings.Break();
  }
}

/// A document without anything.
constexpr std::string_view kEmptyPdf =
    "%PDF-1.4\n1 0 obj<</Type/Catalog/Pages 2 0 R>>endobj\n2 0 obj<</Type/Pages/Kids[]/Count 0>>endobj\n"
    "xref\n0 3\n0000000000 65535 f \n0000000009 00000 n \n0000000052 00000 n \n"
    "trailer<</Root 1 0 R/Size 3>>startxref\n96\n%%EOF";

void ReadDocument(const char* bytes, size_t size, Findings& findings) {
  const Document document(poppler::document::load_from_raw_data(bytes, static_cast<int>(size)));
  if (document == nullptr) return findings.Fail("damaged");
  if (document->is_locked()) return findings.Fail("encrypted");
  AddInformation(*document, findings);
  AddPages(*document, findings);
}

}  // namespace

void PreparePdf() {
  // The library keeps what it knows of the system as long as there is a document.
  static const Document* keeper = nullptr;
  if (keeper != nullptr) return;
  HoldConverter("UTF-8", "UTF-16");
  HoldConverter("UTF-16", "UTF-8");
  HoldCharacterTables();
  poppler::set_debug_error_function(&IgnoreComplaint, nullptr);
  keeper = new Document(poppler::document::load_from_raw_data(kEmptyPdf.data(), static_cast<int>(kEmptyPdf.size())));
}

void ReadPdf(const Source& source, Findings& findings) {
  poppler::set_debug_error_function(&IgnoreComplaint, nullptr);
  const MappedFile file(source);
  if (!file.IsWhole()) return findings.Fail("too large");
  if (file.Data() == nullptr) return findings.Fail("damaged");
  try {
    ReadDocument(reinterpret_cast<const char*>(file.Data()), file.Size(), findings);
  } catch (const std::bad_alloc&) {
    findings.Fail("needs too much memory");
  } catch (const std::exception&) {
    findings.Fail("damaged");
  }
}

}  // namespace ferrox::extract
