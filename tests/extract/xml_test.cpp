// Catches tokens that depend on how the bytes arrive, and containers that expand, hide or repeat members.
#include <gtest/gtest.h>

#include "services/kovacontentextractd/readers/xml_tokenizer.h"
#include "services/kovacontentextractd/readers/zip_container.h"
#include "tests/extract/reader_support.h"

namespace ferrox::extract::test {

namespace {

/// Hands out its bytes in pieces of a given size.
class Pieces : public ByteSource {
 public:
  Pieces(std::string bytes, size_t piece) : bytes_(std::move(bytes)), piece_(piece) {}
  size_t Read(char* buffer, size_t room) override {
    const size_t got = bytes_.copy(buffer, std::min(room, piece_), at_);
    at_ += got;
    return got;
  }

 private:
  std::string bytes_;
  size_t piece_;
  size_t at_ = 0;
};

/// The tokens as one line: "<a k=v>text</a>", with "!" where it is bad.
std::string Tokens(const std::string& bytes, size_t piece) {
  Pieces source(bytes, piece);
  XmlTokenizer xml(source);
  std::string line;
  for (;;) {
    switch (xml.Next()) {
      case XmlTokenizer::Token::kOpen:
        line += "<" + std::string(xml.Name());
        for (const char* name : {"k", "r:id"}) {
          if (!xml.Attribute(name).empty()) line += " " + std::string(name) + "=" + std::string(xml.Attribute(name));
        }
        line += ">";
        break;
      case XmlTokenizer::Token::kClose:
        line += "</" + std::string(xml.Name()) + ">";
        break;
      case XmlTokenizer::Token::kText:
        line += xml.Text();
        break;
      case XmlTokenizer::Token::kBad:
        return line + "!";
      case XmlTokenizer::Token::kEnd:
        return line;
    }
  }
}

std::string Utf16(const std::u16string& text, bool big_endian, bool mark) {
  std::string bytes = mark ? (big_endian ? "\xFE\xFF" : "\xFF\xFE") : "";
  for (const char16_t unit : text) bytes += big_endian ? Big(unit, 2) : Little(unit, 2);
  return bytes;
}

}  // namespace

TEST(XmlTokenizerTest, GivesTheSameTokensInWhateverPiecesTheBytesCome) {
  const struct {
    const char* name;
    std::string bytes;
    std::string tokens;
  } kRows[] = {
      {"elements", "<?xml version='1.0'?><w:a k='1' r:id=\"x\"><b/>t</w:a>", "<a k=1 r:id=x><b></b>t</a>"},
      {"references", "<a k='&lt;&#65;'>&amp;&#xE9;&#x1F600;&nbsp;&#xD800; & b</a>", "<a k=<A>&é😀 & b</a>"},
      {"character data", "<a><![CDATA[<x> ]] ]]>]]&gt;</a>", "<a><x> ]] ]]></a>"},
      {"comments", "<a><!-- <b> -- -->1<?p <c> ?>2</a>", "<a>12</a>"},
      {"document type", "<!DOCTYPE a [<!ENTITY e \"]>x\"> <!ENTITY f SYSTEM 'file:///'>]><a>&e;&f;</a>", "<a></a>"},
      {"characters of several bytes", "<a>Grüße, мир, 世界, 😀</a>", "<a>Grüße, мир, 世界, 😀</a>"},
      {"UTF-16", Utf16(u"<?xml?><a k='ж'>世界😀</a>", false, true), "<a k=ж>世界😀</a>"},
      {"UTF-16 without a mark", Utf16(u"<a>né</a>", true, false), "<a>né</a>"},
      {"cut off in a tag", "<a>text<b k='1", "<a>text"},
      {"cut off in a character", "<a>\xE4\xB8", "<a>\xE4\xB8"},
      {"no attribute value", "<a k=1 k>x</a>", "<a>x</a>"},
      {"a tag that is not closed", "<a <b>x", "<a><b>x"},
      {"more ends than beginnings", "<a></a></a>", "<a></a>!"},
      {"not XML", "a < b", "a !"},
  };
  for (const auto& row : kRows) {
    for (const size_t piece : {1, 3, 100000}) {
      SCOPED_TRACE(std::string(row.name) + " in pieces of " + std::to_string(piece));
      EXPECT_EQ(row.tokens, Tokens(row.bytes, piece));
    }
  }
}

TEST(XmlTokenizerTest, LongTextsComeWhole) {
  std::string text;
  for (int i = 0; i < 20000; ++i) text += "é" + std::to_string(i) + " ";
  EXPECT_EQ("<a>" + text + "</a>", Tokens("<a>" + text + "</a>", 100000));
  EXPECT_EQ("<a>" + text + "</a>", Tokens("<a><![CDATA[" + text + "]]></a>", 100000));
}

TEST(XmlTokenizerTest, DepthAndNamesAreBounded) {
  std::string deep;
  for (int i = 0; i < 100000; ++i) deep += "<a>";
  EXPECT_EQ('!', Tokens(deep, 4096).back());
  const std::string long_name(100000, 'n');
  EXPECT_LT(Tokens("<" + long_name + " k='" + std::string(1 << 20, 'v') + "'/>", 4096).size(), 20000U);
}

namespace {

/// Unpacks every member of a ZIP file.
void ReadEveryMember(const Source& source, Findings& findings) {
  ZipContainer zip(source, findings);
  for (const std::string& name : zip.Names("", "")) {
    (void)findings.AddText(zip.ReadMember(name, 1U << 30));
    findings.Break();
  }
}

std::string Reason(const Json::Value& document) { return Text(document, "_KOVAExtractError"); }

}  // namespace

TEST(ZipContainerTest, NamesAreInTheOrderOfTheirNumbers) {
  const std::string zip = MakeZip({{"s10.x", "ten"}, {"s9.x", "nine"}, {"s1.x", "one"}});
  EXPECT_EQ("one\nnine\nten\n", Text(Read(&ReadEveryMember, zip)));
}

TEST(ZipContainerTest, WhatExpandsToTooMuchIsStopped) {
  const std::string zeros(20 << 20, '0');
  Json::Value document = Read(&ReadEveryMember, MakeZip({{"a", "first"}, {"b", zeros}}));
  EXPECT_EQ("expands to too much", Reason(document));
  EXPECT_EQ("first", Text(document).substr(0, 5));

  // The limit is on all members together; each alone is allowed.
  const std::string part(900 << 10, '0');
  EXPECT_EQ("", Reason(Read(&ReadEveryMember, MakeZip({{"a", part}}))));
  EXPECT_EQ("expands to too much", Reason(Read(&ReadEveryMember, MakeZip({{"a", part}, {"b", part}}))));

  Limits small_members;
  small_members.member_bytes = 1000;
  EXPECT_EQ("expands to too much", Reason(Read(&ReadEveryMember, MakeZip({{"a", part}}), "", small_members)));
}

TEST(ZipContainerTest, OfMembersWithOneNameTheFirstCounts) {
  // The second name is made the first one's by hand, which no packer would do.
  std::string zip = MakeZip({{"a/x", "first"}, {"b/x", "other"}});
  for (size_t at = zip.find("b/x"); at != std::string::npos; at = zip.find("b/x")) zip.replace(at, 3, "a/x");
  EXPECT_EQ("first\nfirst\n", Text(Read(&ReadEveryMember, zip)));
}

TEST(ZipContainerTest, EncryptedMembersAreNamedSo) {
  std::string zip = MakeZip({{"a", "text"}});
  zip[6] = static_cast<char>(zip[6] | 1);  // general purpose bit 0, here and in the directory
  const size_t entry = zip.find("PK\x01\x02");
  zip[entry + 8] = static_cast<char>(zip[entry + 8] | 1);
  EXPECT_EQ("encrypted", Reason(Read(&ReadEveryMember, zip)));
}

TEST(ZipContainerTest, DamageIsBorne) {
  EXPECT_EQ("damaged", Reason(Read(&ReadEveryMember, "PK\x03\x04 no more")));
  std::string text;
  for (int i = 0; i < 500; ++i) text += std::to_string(i * i) + " ";
  Abuse(&ReadEveryMember, MakeZip({{"/absolute/../a", text}, {"é", text}, {"c", "short"}}), "zip");
}

}  // namespace ferrox::extract::test
