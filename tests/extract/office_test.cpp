#include <gtest/gtest.h>

#include "services/kovacontentextractd/readers/cell_numbers.h"
#include "services/kovacontentextractd/readers/electronic_book.h"
#include "services/kovacontentextractd/readers/office_open.h"
#include "services/kovacontentextractd/readers/open_document.h"
#include "tests/extract/reader_support.h"

namespace ferrox::extract::test {

namespace {

std::string Relations(const Members& type_and_target) {
  std::string xml = "<Relationships>";
  for (size_t i = 0; i < type_and_target.size(); ++i) {
    xml += "<Relationship Id='rId" + std::to_string(i + 1) + "' Type='http://x/" + type_and_target[i].first +
           "' Target='" + type_and_target[i].second + "'/>";
  }
  return xml + "</Relationships>";
}

const char kCore[] =
    "<cp:coreProperties><dc:title>Angebot für Müller</dc:title><dc:creator>Anna Östlund;王芳</dc:creator>"
    "<cp:keywords>Dach, Ziegel</cp:keywords><dc:description>Entwurf</dc:description><cp:lastModifiedBy>Iwan"
    "</cp:lastModifiedBy><dcterms:created xsi:type='dcterms:W3CDTF'>2024-03-01T10:00:00Z</dcterms:created>"
    "</cp:coreProperties>";
const char kApplication[] =
    "<Properties><Application>Microsoft Office Word</Application><Pages>7</Pages><Company>Dachbau</Company>"
    "</Properties>";

std::string Document(const std::string& main, const std::string& content, Members further) {
  Members members = {{"_rels/.rels", Relations({{"officeDocument", main},
                                                {"core-properties", "docProps/core.xml"},
                                                {"extended-properties", "/docProps/app.xml"}})},
                     {main, content},
                     {"docProps/core.xml", kCore},
                     {"docProps/app.xml", kApplication}};
  members.insert(members.end(), further.begin(), further.end());
  return MakeZip(members);
}

std::string WordSample() {
  return Document(
      "word/document.xml",
      "<w:document><w:body><w:p><w:pPr><w:tabs><w:tab/></w:tabs></w:pPr><w:r><w:t>Sehr geehrte </w:t></w:r><w:r>"
      "<w:t>Frau</w:t><w:tab/><w:t>Müller</w:t><w:instrText>HYPERLINK</w:instrText><w:delText>gone</w:delText></w:r>"
      "</w:p><w:tbl><w:tr><w:tc><w:p><w:r><w:t>屋根</w:t></w:r></w:p></w:tc></w:tr></w:tbl><mc:AlternateContent>"
      "<mc:Choice><w:p><w:t>box</w:t></w:p></mc:Choice><mc:Fallback><w:p><w:t>box</w:t></w:p></mc:Fallback>"
      "</mc:AlternateContent></w:body></w:document>",
      {{"word/_rels/document.xml.rels", Relations({{"header", "header1.xml"}, {"footnotes", "footnotes.xml"}})},
       {"word/header1.xml", "<w:hdr><w:p><w:r><w:t>Kopf</w:t></w:r></w:p></w:hdr>"},
       {"word/footnotes.xml", "<w:footnotes><w:p><w:t>Fuß</w:t></w:p></w:footnotes>"}});
}

std::string WorkbookSample() {
  return Document(
      "xl/workbook.xml",
      "<workbook><workbookPr/><sheets><sheet name='Umsätze' sheetId='1' r:id='rId1'/></sheets></workbook>",
      {{"xl/_rels/workbook.xml.rels", Relations({{"worksheet", "worksheets/sheet1.xml"},
                                                 {"sharedStrings", "sharedStrings.xml"},
                                                 {"styles", "styles.xml"}})},
       {"xl/sharedStrings.xml",
        "<sst><si><t>Berlin</t></si><si><r><t>東</t></r><r><t>京</t></r><rPh><t>トウ</t></rPh></si></sst>"},
       {"xl/styles.xml",
        "<styleSheet><numFmts><numFmt numFmtId='170' formatCode='[Red]yyyy\\-mm'/><numFmt numFmtId='171' "
        "formatCode='0.00 \"days\"'/></numFmts><cellStyleXfs><xf numFmtId='14'/></cellStyleXfs><cellXfs><xf "
        "numFmtId='0'/><xf numFmtId='14'/><xf numFmtId='170'/><xf numFmtId='171'/></cellXfs></styleSheet>"},
       {"xl/worksheets/sheet1.xml",
        "<worksheet><sheetData><row><c t='s'><v>1</v></c><c><v>0.30000000000000004</v></c><c s='1'><v>45352</v></c>"
        "<c s='2'><v>45352.5</v></c><c s='3'><v>2</v></c></row><row><c t='inlineStr'><is><t>inline</t></is></c>"
        "<c t='str'><f>A1&amp;B1</f><v>made</v></c><c t='b'><v>1</v></c><c t='e'><v>#REF!</v></c></row></sheetData>"
        "</worksheet>"}});
}

std::string PresentationSample() {
  return Document(
      "ppt/presentation.xml",
      "<p:presentation><p:sldIdLst><p:sldId id='256' r:id='rId2'/><p:sldId id='257' r:id='rId1'/></p:sldIdLst>"
      "</p:presentation>",
      {{"ppt/_rels/presentation.xml.rels", Relations({{"slide", "slides/slide1.xml"}, {"slide", "slides/slide2.xml"}})},
       {"ppt/slides/slide1.xml", "<p:sld><a:p><a:r><a:t>Второй слайд</a:t></a:r></a:p></p:sld>"},
       {"ppt/slides/slide2.xml", "<p:sld><a:p><a:r><a:t>Первый</a:t></a:r><a:br/><a:t>слайд</a:t></a:p></p:sld>"},
       {"ppt/slides/_rels/slide2.xml.rels", Relations({{"notesSlide", "../notesSlides/notesSlide1.xml"}})},
       {"ppt/notesSlides/notesSlide1.xml", "<p:notes><a:p><a:t>Заметка</a:t></a:p></p:notes>"}});
}

std::string OpenDocumentSample() {
  return MakeZip(
      {{"mimetype", "application/vnd.oasis.opendocument.text"},
       {"content.xml",
        "<office:document-content><office:automatic-styles><style:style>s</style:style></office:automatic-styles>"
        "<office:body><office:text><text:h>Überschrift</text:h><text:p>Ein<text:s text:c='2'/>Satz"
        "<text:span> mit Ende</text:span></text:p><table:table "
        "table:name='Kosten'><table:table-row><table:table-cell><text:p>42</text:p></"
        "table:table-cell><table:table-cell>"
        "<text:p>43</text:p></table:table-cell></table:table-row></table:table>"
        "</office:text></office:body></office:document-content>"},
       {"meta.xml",
        "<office:document-meta><office:meta><dc:title>Bericht</dc:title><meta:initial-creator>Łukasz"
        "</meta:initial-creator><meta:keyword>eins</meta:keyword><meta:keyword>zwei</meta:keyword>"
        "<meta:creation-date>2023-12-24T18:00:00</meta:creation-date><meta:generator>LibreOffice/7.4</meta:generator>"
        "<meta:document-statistic meta:page-count='3'/></office:meta></office:document-meta>"}});
}

std::string BookSample() {
  return MakeZip(
      {{"META-INF/container.xml",
        "<container><rootfiles><rootfile full-path='OEBPS/content.opf'/></rootfiles></container>"},
       {"OEBPS/content.opf",
        "<package><metadata><dc:title>Fathers &amp; Sons</dc:title><dc:creator>Иван Тургенев</dc:creator>"
        "<dc:language>ru</dc:language><dc:publisher>Verlag</dc:publisher></metadata><manifest>"
        "<item id='b' href='b%20c.xhtml'/><item id='a' href='a.xhtml'/></manifest><spine><itemref idref='a'/>"
        "<itemref idref='b'/></spine></package>"},
       {"OEBPS/a.xhtml", "<html><head><title>t</title></head><body><p>Глава&nbsp;первая</p></body></html>"},
       {"OEBPS/b c.xhtml", "<html><body><p>Глава вторая</p></body></html>"}});
}

}  // namespace

TEST(OfficeOpenTest, TextDocument) {
  const Json::Value document = Read(&ReadOfficeOpen, WordSample(), "docx");
  EXPECT_EQ("Sehr geehrte Frau\tMüller\n屋根\nbox\nFuß\nKopf\n", Text(document));
  EXPECT_EQ("Angebot für Müller", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Anna Östlund, 王芳", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ("Dach, Ziegel", Text(document, "KOVAMDKeywords"));
  EXPECT_EQ("Entwurf", Text(document, "KOVAMDComment"));
  EXPECT_EQ("Microsoft Office Word", Text(document, "KOVAMDCreator"));
  EXPECT_EQ(7, document["KOVAMDNumberOfPages"].asInt());
  EXPECT_EQ(1709287200, document["KOVAMDContentCreationDate"].asInt64());
  EXPECT_FALSE(document.isMember("_KOVAExtractError"));
}

TEST(OfficeOpenTest, NamesOfMembersAsWindowsWritesThem) {
  const std::string document = MakeZip({{"_rels\\.rels",
                                         "<Relationships><Relationship Id='a' Type='x/officeDocument' "
                                         "Target='word/Document.xml'/></Relationships>"},
                                        {"word\\document.xml", "<w:p><w:t>found</w:t></w:p>"}});
  EXPECT_EQ("found\n", Text(Read(&ReadOfficeOpen, document, "docx")));
}

TEST(OfficeOpenTest, WorkbookShowsNumbersAndDatesAsPeopleSeeThem) {
  EXPECT_EQ("Umsätze\nBerlin\n東京\n0.3\t2024-03-01\t2024-03-01 12:00\t2 2.00\t\ninline\tmade\t\n",
            Text(Read(&ReadOfficeOpen, WorkbookSample(), "xlsx")));
}

TEST(OfficeOpenTest, NumbersAreFoundAsTheyAreAndAsTheyAreShown) {
  const struct {
    double value;
    const char* format;
    std::string text;
  } kRows[] = {
      {1234567.891, "#,##0.00", "1234567.891 1,234,567.89"},
      {-1234.5, "#,##0;[Red](#,##0)", "-1234.5 -1,234"},
      {0.153, "0.0%", "0.153 15.3%"},
      {2, "\"USD\" 0.00_)", "2 2.00"},
      {45352, "[$-409]d\\-mmm\\-yy;@", "2024-03-01"},
      {13100501, "dd/mm/yyyy", "13100501"},
      {0.125, "# ?/?", "0.125"},
      {1500000, "0.0,,", "1500000"},
      {1e300, "0.00", "1e+300"},
      {12, "General", "12"},
  };
  for (const auto& row : kRows) EXPECT_EQ(NumberText(row.value, ParseNumberFormat(row.format), false), row.text);
  EXPECT_EQ(NumberText(0.5, BuiltInNumberFormat(9), false), "0.5 50%");
  EXPECT_EQ(NumberText(1234.5, BuiltInNumberFormat(4), false), "1234.5 1,234.50");
  EXPECT_EQ(NumberText(4711, BuiltInNumberFormat(49), false), "4711") << "text";
  EXPECT_EQ(NumberText(1234.5, BuiltInNumberFormat(11), false), "1234.5") << "powers of ten";
}

TEST(OfficeOpenTest, SlidesComeInTheOrderInWhichTheyAreShown) {
  const Json::Value document = Read(&ReadOfficeOpen, PresentationSample(), "pptx");
  EXPECT_EQ("Первый\nслайд\nЗаметка\nВторой слайд\n", Text(document));
  EXPECT_EQ(2, document["KOVAMDNumberOfPages"].asInt());
}

TEST(OpenDocumentTest, TextAndProperties) {
  const Json::Value document = Read(&ReadOpenDocument, OpenDocumentSample(), "odt");
  EXPECT_EQ("Überschrift\nEin Satz mit Ende\nKosten\n42\t43\t\n", Text(document));
  EXPECT_EQ("Bericht", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Łukasz", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ("eins, zwei", Text(document, "KOVAMDKeywords"));
  EXPECT_EQ(3, document["KOVAMDNumberOfPages"].asInt());
  EXPECT_EQ(1703440800, document["KOVAMDContentCreationDate"].asInt64());
}

TEST(OpenDocumentTest, EncryptedOnesAreNamedSo) {
  const std::string zip = MakeZip(
      {{"content.xml", "noise"}, {"META-INF/manifest.xml", "<manifest:encryption-data manifest:checksum='x'/>"}});
  EXPECT_EQ("encrypted", Text(Read(&ReadOpenDocument, zip), "_KOVAExtractError"));
}

TEST(ElectronicBookTest, ChaptersComeInReadingOrder) {
  const Json::Value document = Read(&ReadElectronicBook, BookSample(), "epub");
  EXPECT_EQ("Глава первая\nГлава вторая\n", Text(document));
  EXPECT_EQ("Fathers & Sons", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Иван Тургенев", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ("ru", Text(document, "KOVAMDLanguages"));
  EXPECT_EQ("Verlag", Text(document, "KOVAMDPublishers"));
}

TEST(OfficeOpenTest, HostileDocumentsAreBorne) {
  std::string entities = "<!DOCTYPE d [<!ENTITY a \"xxxxxxxxxx\">";
  for (char c = 'b'; c <= 'z'; ++c) {
    const std::string before = "&" + std::string(1, static_cast<char>(c - 1)) + ";";
    entities += "<!ENTITY " + std::string(1, c) + " \"" + before + before + before + before + "\">";
  }
  const std::string bomb = entities + "]><w:document><w:p><w:t>safe &z;</w:t></w:p></w:document>";
  EXPECT_EQ("safe ", Text(Read(&ReadOfficeOpen, Document("word/document.xml", bomb, {}), "docx")).substr(0, 5));

  std::string repeated;  // 344:1
  while (repeated.size() < (12U << 20)) repeated += "<w:p><w:r><w:t>the same again and again</w:t></w:r></w:p>";
  Limits generous;
  generous.text_bytes = 64U << 20;
  const Json::Value document =
      Read(&ReadOfficeOpen, Document("word/document.xml", "<w:document>" + repeated, {}), "docx", generous);
  EXPECT_EQ("expands to too much", Text(document, "_KOVAExtractError"));
  EXPECT_GT(Text(document).size(), 100000U);

  std::string loop = Relations({{"notesSlide", "slide2.xml"}});  // a slide that is its own notes
  EXPECT_LT(
      Text(Read(&ReadOfficeOpen, Document("ppt/presentation.xml", "<p:sldIdLst><p:sldId r:id='rId1'/></p:sldIdLst>",
                                          {{"ppt/_rels/presentation.xml.rels", Relations({{"slide", "slide2.xml"}})},
                                           {"ppt/_rels/slide2.xml.rels", loop},
                                           {"ppt/slide2.xml", "<a:p><a:t>x</a:t></a:p>"}})))
          .size(),
      10U);
}

TEST(OfficeOpenTest, DamageIsBorne) {
  Abuse(&ReadOfficeOpen, WordSample(), "docx");
  Abuse(&ReadOfficeOpen, WorkbookSample(), "xlsx");
  Abuse(&ReadOfficeOpen, PresentationSample(), "pptx");
  Abuse(&ReadOpenDocument, OpenDocumentSample(), "odt");
  Abuse(&ReadElectronicBook, BookSample(), "epub");
}

}  // namespace ferrox::extract::test
