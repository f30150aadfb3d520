// Catches a text that is shown, and ranked, under a line that does not name it, or under none.
#include "services/kovaelasticd/text/title.h"

#include <string>

#include <gtest/gtest.h>

namespace ferrox::engine {
namespace {

struct Case {
  const char* text;
  const char* ext;
  const char* title;
};

TEST(TitleTest, TextsAreNamedByWhatTheyCallThemselves) {
  const Case cases[] = {
      {".\\\" Rights\n.TH LSOF 8\n.SH \"NAME\"\n\\fBlsof\\fP \\- list\nopen files\n.SH X\nelse", "8",
       "lsof - list open files"},
      {".Dd 2026\n.Sh NAME\n.Nm ls ,\n.Nm \"dir\"\n.Nd list \\s-1DIRS\\s0\n.Sh OPTIONS\n", "gz", "ls, dir - list DIRS"},
      {"LS(1)      User Commands      LS(1)\n\nNAME\n       ls - list files\n\nSYNOPSIS\n", "txt", "ls - list files"},
      {"<!-- made by hand -->\n\n[![build](https://a)](b)\n\n# The `fox` and [hounds](http://x) #\ntext", "md",
       "The fox and hounds"},
      {"---\nlayout: page\ntitle: On foxes\n---\n# Else\n", "md", "On foxes"},
      {"Prose that goes on and on\nwithout an end.\n\nFoxes\n=====\n", "md", "Foxes"},
      {".. a comment\n   of two lines\n\n*****\nFoxes\n*****\n\nRed\n---\n", "rst", "Foxes"},
      {"From a@b Mon\nReceived: x\n\ty\nSubject: Hunting\nFrom: Ann <a@b>\n\nHello\n", "txt", "Hunting"},
      {"\xEF\xBB\xBF  Minutes of the 3rd meeting \x1B[0m\n\n1 Foxes\n", "txt", "Minutes of the 3rd meeting [0m"},
      {"Copyright (c) 2026 Ann\nAll else is foxes\n\n22.11.2026\n\nInvoice 2026-0815\nDear Sir or Madam, thank you\n",
       "pdf", "Invoice 2026-0815"},
      {"\xD0\x9E \xD0\xBB\xD0\xB8\xD1\x81\xD0\xB0\xD1\x85\n\n", "",
       "\xD0\x9E \xD0\xBB\xD0\xB8\xD1\x81\xD0\xB0\xD1\x85"},
  };
  for (const Case& one : cases) EXPECT_EQ(TitleOf(one.text, one.ext), one.title) << one.text;
}

TEST(TitleTest, WhatIsNoTitleIsNotTakenForOne) {
  const Case cases[] = {
      {"#!/bin/sh\nset -e\n\nfoxes=1\n", "", ""},
      {"# a comment\n# of two lines\nfoxes = 1\n", "", ""},
      {"The fox lives in holes that are deep and dark and does\nnot care.\n\nNext\n====\n", "txt", ""},
      {"id,name,age\n1,fox,3\n", "", ""},
      {"Hunting\n\nfoxes", "csv", ""},
      {"lsof (4.95-1) unstable; urgency=medium\n\n  * Fox\n", "gz", ""},
      {"Sunday, 22 November 2026\n", "txt", ""},
      {"Format: https://a\nName: fox\n", "", ""},
      {"-----\n123 456\n", "", ""},
      {".TH FOX 1\n.PP\ntext", "1", ""},
      {"", "", ""},
  };
  for (const Case& one : cases) EXPECT_EQ(TitleOf(one.text, one.ext), one.title) << one.text;
}

TEST(TitleTest, LongTitlesEndWithinTheirBound) {
  std::string names;
  for (int i = 0; i < 40; ++i) names += "name" + std::to_string(i) + ", ";
  const std::string title = TitleOf(".SH NAME\n" + names + "last \\- many names\n", "3");
  EXPECT_LE(title.size(), kTitleMaxBytes);
  EXPECT_EQ(title.substr(title.size() - 13), " - many names");
  std::string umlauts = "x";
  for (int i = 0; i < 150; ++i) umlauts += "\xC3\xA4";
  EXPECT_EQ(TitleOf("# " + umlauts, "md"), umlauts.substr(0, 199));
}

}  // namespace
}  // namespace ferrox::engine
