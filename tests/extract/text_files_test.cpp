// What the readers get out of text: guesses, markup, and input that means no good. Texts in the usual encodings are
// among the samples (samples_test.cpp).

#include "services/kovacontentextractd/readers/text_files.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <string>

#include <gtest/gtest.h>
#include <json/value.h>

#include <kova/content_type.h>

#include "base/unique_fd.h"
#include "common/file_util.h"
#include "tests/support/temp_dir.h"

namespace ferrox::test {
namespace {

using std::string;
using namespace std::literals;

constexpr size_t kMiB = 1 << 20;

extract::Reader ReaderOf(const string& extension, const string& bytes) {
  const char* type = kova::content::TypeOf(extension, std::string_view(bytes).substr(0, kova::content::kHeadBytes));
  const kova::content::Format* format = type == nullptr ? &kova::content::kUnknown : kova::content::FormatOf(type);
  if (format == nullptr) return nullptr;
  const string reader = format->reader;
  if (reader == "html") return &extract::ReadHtmlFile;
  if (reader == "xml") return &extract::ReadXmlFile;
  return reader == "plain" ? &extract::ReadPlainFile : &extract::ReadUnknownFile;
}

class TextFilesTest : public testing::Test {
 protected:
  Json::Value ParseBytes(const string& name, const string& bytes) {
    WriteFile(dir_ / name, bytes);
    const base::UniqueFd file(open((dir_ / name).c_str(), O_RDONLY | O_CLOEXEC));
    extract::Findings findings;
    const string extension = GetFileExtension(name, true);
    const extract::Reader reader = ReaderOf(extension, bytes);
    if (reader != nullptr) reader({file.Get(), bytes.size(), name, extension}, findings);
    return findings.ToDocument();
  }
  string Text(const string& name, const string& bytes) {
    return ParseBytes(name, bytes)["KOVAMDTextContent"].asString();
  }

  TempDir dir_;
};

const char kRussian[] =
    "В начале июля, в чрезвычайно жаркое время, под вечер, один молодой человек вышел из своей каморки, которую "
    "нанимал от жильцов в переулке, на улицу и медленно, как бы в нерешимости, отправился к мосту.\n";
TEST_F(TextFilesTest, AShortTextIsAGuessAndSaysSo) {
  EXPECT_EQ("UTF-8", ParseBytes("a.txt", "plain\n")["_KOVATextEncoding"].asString());
  const Json::Value guessed = ParseBytes("b.txt", "caf\xe9\n");
  EXPECT_NE(string::npos, guessed["_KOVATextEncoding"].asString().find("(guess)"));
  EXPECT_EQ(0U, guessed["KOVAMDTextContent"].asString().find("caf"));
  // One stray byte does not make a file of good UTF-8 something else.
  const Json::Value damaged = ParseBytes("c.txt", string(kRussian) + "\xff");
  EXPECT_EQ("UTF-8", damaged["_KOVATextEncoding"].asString());
  EXPECT_EQ(string(kRussian) + "\xEF\xBF\xBD", damaged["KOVAMDTextContent"].asString());
}

TEST_F(TextFilesTest, WhatIsNoTextSaysSo) {
  string noise(5000, '\0');
  uint32_t state = 1;
  for (char& c : noise) c = static_cast<char>((state = state * 1664525 + 1013904223) >> 24);
  const string rows[] = {string(100, '\0'), string(kMiB, '\0'), noise, "a\0b"s, "\xFF\xFE\0\0\0\0"s + noise};
  for (const string& bytes : rows) {
    for (const char* name : {"x.txt", "x.html", "x.unknownext", "x"}) {
      const Json::Value document = ParseBytes(name, bytes);
      EXPECT_EQ("not text", document["_KOVAExtractError"].asString()) << name << " " << bytes.size();
      EXPECT_FALSE(document.isMember("KOVAMDTextContent"));
    }
  }
  const Json::Value empty = ParseBytes("empty.txt", "");
  EXPECT_FALSE(empty.isMember("KOVAMDTextContent") || empty.isMember("_KOVAExtractError"));
}

TEST_F(TextFilesTest, Html) {
  const struct {
    string source, text, title;
  } rows[] = {
      {"<html><head><title>The &amp; Title</title></head><body><p>One<p>Two</body>", "One\nTwo", "The & Title"},
      {"a<b>b</b>c <i>d</i>", "abc d", ""},
      {"x<script>var a = '<p>no</p>';</script>y<STYLE>p{}</STYLE>z", "x\ny\nz", ""},
      {"<a title=\"1 > 0\" href='x'>link</a>", "link", ""},
      {"&eacute;&#233;&#xE9;&nbsp;&bogus; &amp;lt; AT&T &#x110000; &#150;",
       "\u00e9\u00e9\u00e9 &bogus; &lt; AT&T \uFFFD \u2013", ""},
      {"<!-- hidden <p> -->seen<!-- open", "seen", ""},
      {"a\u00a0\u00a0b &nbsp; c\u00a9d", "a b c\u00a9d", ""},
      {"1 < 2 && 3 > 2", "1 < 2 && 3 > 2", ""},
      {"<p>unclosed <b attr=\"quote>text", "unclosed text", ""},
      {"<td>a</td><td>b</td><br>c", "a b\nc", ""},
      {"text<script>never closed", "text", ""},
      {"<title>first</title><svg><title>second</title></svg>", "second", "first"},
  };
  for (const auto& row : rows) {
    const Json::Value document = ParseBytes("page.html", row.source);
    EXPECT_EQ(row.text, document["KOVAMDTextContent"].asString()) << row.source;
    EXPECT_EQ(row.title, document["KOVAMDTitle"].asString()) << row.source;
  }
}

TEST_F(TextFilesTest, MarkupIsReadInTheEncodingItDeclares) {
  const string word = "\xcf\xf0\xe8\xe2\xe5\xf2";  // "Привет" in Windows-1251: too short to be detected
  EXPECT_EQ("Привет", Text("a.html", "<META http-equiv=x content='text/html; charset=windows-1251'>" + word));
  EXPECT_EQ("Привет", Text("b.html", "<html><meta charset=\"windows-1251\">" + word));
  EXPECT_EQ("Привет", Text("c.xml", "<?xml version='1.0' encoding='windows-1251'?><a>" + word + "</a>"));
  EXPECT_EQ("Привет", Text("d.html", "<meta charset=windows-1251>Привет")) << "bytes that are UTF-8 are UTF-8";
  EXPECT_EQ("abc", Text("e.html", "<meta charset=no-such-thing>abc"));
}

TEST_F(TextFilesTest, XmlDefinesNothingAndFetchesNothing) {
  string bomb = "<!DOCTYPE lolz [<!ENTITY lol \"lol\">";
  for (int i = 1; i < 20; ++i) bomb += "<!ENTITY lol" + std::to_string(i) + " \"&lol;&lol;&lol;&lol;&lol;\">";
  EXPECT_EQ("&lol19;", Text("bomb.xml", "<?xml version=\"1.0\"?>" + bomb + "]><lolz>&lol19;</lolz>"));
  const string external = "<!DOCTYPE a [<!ENTITY x SYSTEM \"file:///etc/passwd\">]><a>&x; &amp;</a>";
  EXPECT_EQ("&x; &", Text("external.xml", external));
  EXPECT_EQ("a <b> c", Text("cdata.xml", "<x>a <![CDATA[<b>]]> c</x>"));
  const Json::Value titled = ParseBytes("t.xml", "<r><dc:title>T</dc:title><y>b</y><z>c</z></r>");
  EXPECT_EQ("T", titled["KOVAMDTitle"].asString());
  EXPECT_EQ("b c", titled["KOVAMDTextContent"].asString());
}

TEST_F(TextFilesTest, HostileMarkupTakesLinearTime) {
  const auto repeat = [](const string& piece) {
    string text;
    while (text.size() < 2 * kMiB) text += piece;
    return text;
  };
  for (const char* piece :
       {"<a>", "<", "<a '", "<a \"", "<a b='\"", "&", "&#", "<!--", "<![CDATA[", "<!DOCTYPE [", "</", "<script></scrip",
        "<title>", "<title", "<meta charset", "<?xml encoding", "]]>", "\xff\xfe"}) {
    for (const char* name : {"x.html", "x.xml"}) (void)ParseBytes(name, repeat(piece));
  }
  // 72 MiB in all: a search that began again at each piece would run into the test's time limit.
}

TEST_F(TextFilesTest, LongTextIsCutAtACharacter) {
  string text;
  while (text.size() < 3 * kMiB) text += "\u20ac";
  const Json::Value document = ParseBytes("long.txt", text);
  const string got = document["KOVAMDTextContent"].asString();
  EXPECT_LE(got.size(), kMiB);
  EXPECT_GT(got.size(), kMiB - 4);
  EXPECT_EQ(0U, got.size() % 3);
  EXPECT_TRUE(document["_KOVATextCut"].asBool());
  EXPECT_FALSE(ParseBytes("fits.txt", string(kMiB, 'a')).isMember("_KOVATextCut"));
}

}  // namespace
}  // namespace ferrox::test
