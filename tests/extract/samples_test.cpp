// What each reader makes of the files in samples/, which has a folder for each reader: all that expected.json lists for
// a file is found, and nothing else. Catches what is lost, garbled, put out of order or invented on the way from a
// format to fields and text, and readers that break on damage.

#include <unistd.h>

#include <fstream>
#include <sstream>

#include <gtest/gtest.h>

#include "common/json_util.h"
#include "services/kovacontentextractd/readers/archive.h"
#include "services/kovacontentextractd/readers/audio.h"
#include "services/kovacontentextractd/readers/electronic_book.h"
#include "services/kovacontentextractd/readers/mail.h"
#include "services/kovacontentextractd/readers/office_open.h"
#include "services/kovacontentextractd/readers/old_office.h"
#include "services/kovacontentextractd/readers/open_document.h"
#include "services/kovacontentextractd/readers/pdf/pdf.h"
#include "services/kovacontentextractd/readers/photo/photo.h"
#include "services/kovacontentextractd/readers/rich_text.h"
#include "services/kovacontentextractd/readers/text_files.h"
#include "services/kovacontentextractd/readers/video/video.h"
#include "tests/extract/reader_support.h"

namespace ferrox::extract::test {
namespace {

const struct {
  const char* folder;
  Reader reader;
  int damages;  // how often a sample is damaged; the films' library is slow, and the plain reader takes any bytes
} kReaders[] = {
    {"archive", &ReadArchive, 300},
    {"audio", &ReadAudio, 300},
    {"book", &ReadElectronicBook, 300},
    {"mail", &ReadMail, 300},
    {"office", &ReadOfficeOpen, 300},
    {"old-office", &ReadOldOffice, 300},
    {"open-document", &ReadOpenDocument, 300},
    {"pdf", &ReadPdf, 300},
    {"photo", &ReadPhoto, 300},
    {"plain", &ReadPlainFile, 0},
    {"rich-text", &ReadRichText, 300},
    {"video", &ReadVideo, 100},
};

std::string ContentOf(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  EXPECT_TRUE(file.is_open()) << path;
  std::ostringstream content;
  content << file.rdbuf();
  return content.str();
}

class SamplesTest : public testing::TestWithParam<size_t> {
 protected:
  SamplesTest() {
    PreparePdf();
    PreparePhoto();
    EXPECT_TRUE(fromFile(expected_, FERROX_SAMPLES "/expected.json"));
  }
  /// Calls `check` for each of the reader's samples with its bytes, its extension and its entry in the list.
  template <typename Check>
  void ForEachSample(const Check& check) {
    const std::string folder = std::string(kReaders[GetParam()].folder) + "/";
    size_t count = 0;
    for (const std::string& name : expected_.getMemberNames()) {
      if (name.compare(0, folder.size(), folder) != 0) continue;
      ++count;
      SCOPED_TRACE(name);
      check(ContentOf(FERROX_SAMPLES "/" + name), name.substr(name.find('.') + 1), expected_[name]);
    }
    EXPECT_GT(count, 0U);
  }

  const Reader reader_ = kReaders[GetParam()].reader;
  Json::Value expected_;
};

TEST_P(SamplesTest, AreReadAsExpected) {
  const bool has_tables = access("/usr/share/poppler/cMap", F_OK) == 0;  // of the package poppler-data
  ForEachSample([&](const std::string& bytes, const std::string& extension, const Json::Value& expected) {
    if (reader_ == &ReadPdf && !has_tables && Text(expected).find("中文") != std::string::npos) return;
    Json::Value document = Read(reader_, bytes, extension);
    if (!expected.isMember("_KOVATextEncoding")) document.removeMember("_KOVATextEncoding");
    EXPECT_EQ(toString(expected), toString(document));
  });
}

TEST_P(SamplesTest, DamageIsBorne) {
  ForEachSample([&](const std::string& bytes, const std::string& extension, const Json::Value&) {
    const int damages = kReaders[GetParam()].damages;
    if (!bytes.empty() && bytes.size() < 10000 && damages > 0) Abuse(reader_, bytes, extension, damages);
  });
}

INSTANTIATE_TEST_SUITE_P(Of, SamplesTest, testing::Range<size_t>(0, std::size(kReaders)), [](const auto& tested) {
  std::string name = kReaders[tested.param].folder;
  std::erase(name, '-');
  return name;
});

TEST(HostileSamplesTest, WhatNestsOrRepeatsWithoutEndIsStopped) {
  EXPECT_EQ("damaged", Text(Read(&ReadRichText, "{\\rtf1" + std::string(1 << 20, '{'), "rtf"), "_KOVAExtractError"));

  std::string parts, letters = "Subject: 0\n";
  for (int i = 0; i < 20000; ++i) {
    const std::string boundary = "b" + std::to_string(i);
    parts += "Content-Type: multipart/mixed; boundary=" + boundary + "\n\n--" + boundary + "\n";
  }
  (void)Read(&ReadMail, parts, "eml");
  for (int i = 1; i < 2000; ++i) letters += "Content-Type: message/rfc822\n\nSubject: " + std::to_string(i) + "\n";
  EXPECT_EQ("1\n2\n", Text(Read(&ReadMail, letters + "\ntext", "eml")));

  std::string repeated;  // 344:1
  while (repeated.size() < (12U << 20)) repeated += "<w:p><w:r><w:t>the same again and again</w:t></w:r></w:p>";
  Limits generous;
  generous.text_bytes = 64U << 20;
  const std::string relations =
      "<Relationships><Relationship Id='a' Type='x/officeDocument' Target='word/document.xml'/></Relationships>";
  const Json::Value document =
      Read(&ReadOfficeOpen, MakeZip({{"_rels/.rels", relations}, {"word/document.xml", "<w:document>" + repeated}}),
           "docx", generous);
  EXPECT_EQ("expands to too much", Text(document, "_KOVAExtractError"));
  EXPECT_GT(Text(document).size(), 100000U);
}

}  // namespace
}  // namespace ferrox::extract::test
