#include "services/kovacontentextractd/readers/pdf/pdf.h"

#include <unistd.h>

#include <gtest/gtest.h>

#include "tests/extract/reader_support.h"

namespace ferrox::extract::test {

namespace {

std::string Stream(const std::string& content, const std::string& entries = "") {
  return "<</Length " + std::to_string(content.size()) + entries + ">>stream\n" + content + "\nendstream";
}

/// A PDF of these objects, the first of which is the catalogue; `trailer` goes into its trailer.
std::string Pdf(const std::vector<std::string>& objects, const std::string& trailer) {
  std::string pdf = "%PDF-1.6\n", table;
  for (size_t i = 0; i < objects.size(); ++i) {
    const std::string offset = std::to_string(pdf.size());
    table += std::string(10 - offset.size(), '0') + offset + " 00000 n \n";
    pdf += std::to_string(i + 1) + " 0 obj\n" + objects[i] + "\nendobj\n";
  }
  const std::string size = std::to_string(objects.size() + 1), start = std::to_string(pdf.size());
  return pdf + "xref\n0 " + size + "\n0000000000 65535 f \n" + table + "trailer<</Root 1 0 R/Size " + size + trailer +
         ">>\nstartxref\n" + start + "\n%%EOF\n";
}

const char kXmp[] =
    "<x:xmpmeta><rdf:RDF><rdf:Description><dc:title><rdf:Alt><rdf:li>other</rdf:li></rdf:Alt></dc:title>"
    "<dc:subject><rdf:Bag><rdf:li>Hafen</rdf:li><rdf:li>Šibenik</rdf:li></rdf:Bag></dc:subject></rdf:Description>"
    "</rdf:RDF></x:xmpmeta>";

std::string Sample() {
  const std::string font = "<</Type/Font/Subtype/Type1/BaseFont/Helvetica/Encoding/WinAnsiEncoding>>";
  const std::string chinese =
      "<</Type/Font/Subtype/Type0/BaseFont/A/Encoding/GBK-EUC-H/DescendantFonts[<</Type/Font/Subtype/CIDFontType0"
      "/BaseFont/A/CIDSystemInfo<</Registry(Adobe)/Ordering(GB1)/Supplement 0>>/FontDescriptor<</Type/FontDescriptor"
      "/FontName/A/Flags 4>>>>]>>";
  return Pdf(
      {"<</Type/Catalog/Pages 2 0 R/Metadata 8 0 R>>", "<</Type/Pages/Kids[3 0 R 4 0 R]/Count 2>>",
       "<</Type/Page/Parent 2 0 R/MediaBox[0 0 595 842]/Contents 5 0 R/Resources<</Font<</F " + font + ">>>>>>",
       "<</Type/Page/Parent 2 0 R/MediaBox[0 0 595 842]/Contents 6 0 R/Resources<</Font<</F " + chinese + ">>>>>>",
       Stream("BT /F 12 Tf 50 700 Td (Gr\\374\\337e aus Kiel) Tj ET"), Stream("BT /F 12 Tf 50 700 Td <D6D0CEC4> Tj ET"),
       "<</Title<FEFF041E0442044704510442>/Author(Anna Berg)/Producer(printer)/CreationDate(D:20240301140000+02'00')>>",
       Stream(kXmp, "/Type/Metadata/Subtype/XML")},
      "/Info 7 0 R");
}

}  // namespace

TEST(PdfTest, TextAndInformation) {
  PreparePdf();
  const Json::Value document = Read(&ReadPdf, Sample(), "pdf");
  EXPECT_NE(std::string::npos, Text(document).find("Grüße aus Kiel")) << Text(document);
  EXPECT_EQ("Отчёт", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Anna Berg", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ("Hafen, Šibenik", Text(document, "KOVAMDKeywords"));
  EXPECT_EQ("printer", Text(document, "KOVAMDEncodingApplications"));
  EXPECT_EQ(2, document["KOVAMDNumberOfPages"].asInt());
  EXPECT_EQ(595, document["KOVAMDPageWidth"].asDouble());
  EXPECT_EQ(1709294400, document["KOVAMDContentCreationDate"].asInt64());
}

TEST(PdfTest, EastAsianTextByTheLibrarysTables) {
  if (access("/usr/share/poppler/cMap", F_OK) != 0) GTEST_SKIP() << "poppler-data is not installed";
  EXPECT_NE(std::string::npos, Text(Read(&ReadPdf, Sample(), "pdf")).find("中文"));
}

TEST(PdfTest, WhatCannotBeReadSaysWhy) {
  const std::string encrypted =
      Pdf({"<</Type/Catalog/Pages 2 0 R>>", "<</Type/Pages/Kids[]/Count 0>>",
           "<</Filter/Standard/V 1/R 2/P -44/O<" + std::string(64, '1') + ">/U<" + std::string(64, '2') + ">>>"},
          "/Encrypt 3 0 R/ID[<00><00>]");
  EXPECT_EQ("encrypted", Text(Read(&ReadPdf, encrypted, "pdf"), "_KOVAExtractError"));
  EXPECT_EQ("damaged", Text(Read(&ReadPdf, "%PDF-1.4 nothing", "pdf"), "_KOVAExtractError"));
  EXPECT_EQ("damaged", Text(Read(&ReadPdf, "", "pdf"), "_KOVAExtractError"));
}

TEST(PdfTest, LoopsAndDamageAreBorne) {
  (void)Read(&ReadPdf, Pdf({"<</Type/Catalog/Pages 2 0 R>>", "<</Type/Pages/Kids[2 0 R 2 0 R]/Count 1000000>>"}, ""));
  (void)Read(&ReadPdf, Pdf({"<</Type/Catalog/Pages 2 0 R>>", "<</Type/Pages/Kids[3 0 R]/Count 1>>",
                            "<</Type/Page/MediaBox[0 0 9 9]/Contents 4 0 R/Resources<</XObject<</X 4 0 R>>>>>>",
                            Stream("/X Do /X Do", "/Type/XObject/Subtype/Form/Resources<</XObject<</X 4 0 R>>>>")},
                           ""));
  Abuse(&ReadPdf, Sample(), "pdf");
}

}  // namespace ferrox::extract::test
