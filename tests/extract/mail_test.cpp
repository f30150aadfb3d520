#include "services/kovacontentextractd/readers/mail.h"

#include <gtest/gtest.h>

#include "tests/extract/reader_support.h"

namespace ferrox::extract::test {

namespace {

const char kHeader[] =
    "From: =?utf-8?Q?J=C3=BCrgen_Wei=C3=9F?= <jw@example.org>\r\n"
    "To: Anna Berg <anna@example.org>, team: ben@example.net;\r\n"
    "Cc: =?koi8-r?B?6dfBzg==?= <ivan@example.org>\r\n"
    "Subject: =?utf-8?B?0J7RgtGH0ZHRgg==?= 2024\r\n"
    "Date: Fri, 01 Mar 2024 14:00:00 +0200\r\n"
    "Message-ID: <1@example.org>\r\nMIME-Version: 1.0\r\n";

std::string Sample() {
  return std::string(kHeader) +
         "Content-Type: multipart/mixed; boundary=outer\r\n\r\npreamble\r\n--outer\r\n"
         "Content-Type: multipart/alternative; boundary=inner\r\n\r\n--inner\r\n"
         "Content-Type: text/plain; charset=iso-8859-1\r\nContent-Transfer-Encoding: quoted-printable\r\n\r\n"
         "Gr=FC=DFe aus=\r\n Kiel\r\n--inner\r\n"
         "Content-Type: text/html\r\n\r\n<p>the same again</p>\r\n--inner--\r\n--outer\r\n"
         "Content-Type: text/html; charset=utf-8\r\n\r\n<p>Caf&eacute; <b>noir</b></p>\r\n--outer\r\n"
         "Content-Type: text/csv; charset=utf-8\r\nContent-Disposition: attachment; filename=\"zahlen.csv\"\r\n"
         "Content-Transfer-Encoding: base64\r\n\r\nZWlucyx6d2VpCg==\r\n--outer\r\n"
         "Content-Type: application/pdf; name*=utf-8''%D0%B4%D0%BE%D0%BA.pdf\r\n"
         "Content-Transfer-Encoding: base64\r\n\r\nJVBERi0=\r\n--outer\r\nContent-Type: message/rfc822\r\n\r\n"
         "Subject: forwarded\r\n\r\ninner text\r\n--outer--\r\n";
}

std::string Box() {
  return "From a@example.org Fri Mar  1 12:00:00 2024\nFrom: a@example.org\nSubject: first\n\none\n>From here\n\n"
         "From b@example.org Fri Mar  1 13:00:00 2024\nFrom: Ben <b@example.org>\nSubject: second\n\ntwo\n";
}

}  // namespace

TEST(MailTest, PeopleSubjectDateTextsAndAttachments) {
  const Json::Value document = Read(&ReadMail, Sample(), "eml");
  EXPECT_EQ("Отчёт 2024", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Jürgen Weiß", Text(document, "KOVAMDAuthors"));
  EXPECT_EQ("jw@example.org", Text(document, "KOVAMDAuthorAddresses"));
  EXPECT_EQ("Anna Berg, ben@example.net, Иван", Text(document, "KOVAMDRecipients"));
  EXPECT_EQ("anna@example.org, ben@example.net, ivan@example.org", Text(document, "KOVAMDRecipientAddresses"));
  EXPECT_EQ(1709294400, document["KOVAMDContentCreationDate"].asInt64());
  EXPECT_EQ("Grüße aus Kiel\nCafé noir\nzahlen.csv\neins,zwei\nдок.pdf\nforwarded\ninner text\n", Text(document));
}

TEST(MailTest, HeadersInEncodingsThatTheyDoNotName) {
  // "Тема письма", "Иван" in Windows-1251; German in Latin-1.
  Json::Value document = Read(
      &ReadMail, "Subject: \xD2\xE5\xEC\xE0 \xEF\xE8\xF1\xFC\xEC\xE0\nFrom: \xC8\xE2\xE0\xED <i@example.org>\n\nx");
  EXPECT_EQ("Тема письма", Text(document, "KOVAMDTitle"));
  EXPECT_EQ("Иван", Text(document, "KOVAMDAuthors"));
  document = Read(&ReadMail,
                  "Subject: Gr\xFC\xDF"
                  "e\n\nx");
  EXPECT_EQ("Grüße", Text(document, "KOVAMDTitle"));
}

TEST(MailTest, BoxOfMessages) {
  const Json::Value document = Read(&ReadMail, Box(), "mbox");
  EXPECT_NE(std::string::npos, Text(document).find("first\none\n")) << Text(document);
  EXPECT_NE(std::string::npos, Text(document).find("second\ntwo\n")) << Text(document);
  EXPECT_EQ("a@example.org, Ben", Text(document, "KOVAMDAuthors"));
  EXPECT_FALSE(document.isMember("KOVAMDTitle"));
}

TEST(MailTest, WhatIsLeftOutIsTold) {
  const auto reason = [](const std::string& message) { return Text(Read(&ReadMail, message), "_KOVAExtractError"); };
  std::string deep = "text", people = "a@example.org", parts;
  for (int level = 0; level < 4; ++level) deep = "Content-Type: message/rfc822\r\n\r\n" + deep;
  for (int i = 0; i < 600; ++i) people += ",\r\n b" + std::to_string(i) + "@example.org";
  for (int i = 0; i < 51; ++i) parts += "--x\r\nContent-Type: application/pdf\r\n\r\n%PDF-\r\n";
  EXPECT_EQ("", reason(Sample()));
  EXPECT_EQ("partly read: not the messages deep within others", reason(deep));
  EXPECT_EQ("partly read: not all of its people", reason("To: " + people + "\r\n\r\nx"));
  EXPECT_EQ("partly read: not all of its attachments",
            reason("Content-Type: multipart/mixed; boundary=x\r\n\r\n" + parts + "--x--\r\n"));
  EXPECT_EQ("partly read: not all of a long field", reason("Keywords: " + std::string(40000, 'k') + "\r\n\r\nx"));
}

TEST(MailTest, HostileMessagesAreBorne) {
  std::string deep = kHeader, messages = "Subject: 0\n";
  for (int i = 0; i < 20000; ++i) {
    const std::string boundary = "b" + std::to_string(i);
    deep += "Content-Type: multipart/mixed; boundary=" + boundary + "\n\n--" + boundary + "\n";
  }
  (void)Read(&ReadMail, deep, "eml");
  for (int i = 1; i < 2000; ++i) messages += "Content-Type: message/rfc822\n\nSubject: " + std::to_string(i) + "\n";
  EXPECT_EQ("1\n2\n", Text(Read(&ReadMail, messages + "\ntext", "eml")));
  Abuse(&ReadMail, Sample(), "eml");
  Abuse(&ReadMail, Box(), "mbox");
}

}  // namespace ferrox::extract::test
