#include "services/kovacontentextractd/readers/archive.h"

#include <archive.h>
#include <archive_entry.h>
#include <locale.h>

#include <gtest/gtest.h>

#include "tests/extract/reader_support.h"

namespace ferrox::extract::test {

namespace {

using Support = int (*)(archive*);

/// An archive with a file of 1,000 bytes, one of `zeros` zeros, and one with a Russian name.
std::string Archive(Support format, Support filter, size_t zeros = 10) {
  (void)setlocale(LC_CTYPE, "C.UTF-8");  // for the writer of 7z; the reader does not depend on it
  archive* writer = archive_write_new();
  EXPECT_GE(format(writer), ARCHIVE_WARN);
  EXPECT_GE(filter(writer), ARCHIVE_WARN);
  std::string bytes(zeros + (1 << 16), '\0');
  size_t used = 0;
  EXPECT_EQ(ARCHIVE_OK, archive_write_open_memory(writer, bytes.data(), bytes.size(), &used));
  for (const auto& [name, content] : Members{
           {"folder/first.txt", std::string(1000, 'x')}, {"zeros", std::string(zeros, '\0')}, {"отчёт.txt", "text"}}) {
    archive_entry* entry = archive_entry_new();
    archive_entry_set_pathname_utf8(entry, name.c_str());
    archive_entry_set_pathname(entry, name.c_str());
    archive_entry_set_filetype(entry, AE_IFREG);
    archive_entry_set_size(entry, static_cast<la_int64_t>(content.size()));
    EXPECT_GE(archive_write_header(writer, entry), ARCHIVE_WARN) << archive_error_string(writer);
    EXPECT_EQ(static_cast<la_ssize_t>(content.size()), archive_write_data(writer, content.data(), content.size()));
    archive_entry_free(entry);
  }
  EXPECT_EQ(ARCHIVE_OK, archive_write_close(writer));
  EXPECT_EQ(ARCHIVE_OK, archive_write_free(writer));
  (void)setlocale(LC_CTYPE, "C");
  bytes.resize(used);
  return bytes;
}

const char kNames[] = "folder/first.txt\nzeros\nотчёт.txt\n";

}  // namespace

TEST(ArchiveTest, NamesInEachKindOfArchive) {
  const struct {
    const char* extension;
    Support format;
    Support filter;
  } kRows[] = {
      {"tar", &archive_write_set_format_ustar, &archive_write_add_filter_none},
      {"tar.gz", &archive_write_set_format_ustar, &archive_write_add_filter_gzip},
      {"tar.bz2", &archive_write_set_format_gnutar, &archive_write_add_filter_bzip2},
      {"tar.xz", &archive_write_set_format_pax, &archive_write_add_filter_xz},
      {"tar.zst", &archive_write_set_format_ustar, &archive_write_add_filter_zstd},
      {"7z", &archive_write_set_format_7zip, &archive_write_add_filter_none},
      {"cpio", &archive_write_set_format_cpio_newc, &archive_write_add_filter_none},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.extension);
    const std::string bytes = Archive(row.format, row.filter);
    const Json::Value document = Read(&ReadArchive, bytes, row.extension);
    EXPECT_EQ(kNames, Text(document));
    EXPECT_EQ("", Text(document, "_KOVAExtractError"));
    Abuse(&ReadArchive, bytes, row.extension);
  }
  EXPECT_EQ("a/b.txt\nд.txt\n", Text(Read(&ReadArchive, MakeZip({{"a/b.txt", "1"}, {"д.txt", "2"}}), "zip")));
}

TEST(ArchiveTest, APackedFileGivesItsText) {
  archive* writer = archive_write_new();
  char bytes[4096];
  size_t used = 0;
  EXPECT_EQ(ARCHIVE_OK, archive_write_set_format_raw(writer) | archive_write_add_filter_gzip(writer));
  EXPECT_EQ(ARCHIVE_OK, archive_write_open_memory(writer, bytes, sizeof bytes, &used));
  archive_entry* entry = archive_entry_new();
  archive_entry_set_filetype(entry, AE_IFREG);
  EXPECT_EQ(ARCHIVE_OK, archive_write_header(writer, entry));
  EXPECT_EQ(7, archive_write_data(writer, "log: \xC3\xA9", 7));
  archive_entry_free(entry);
  EXPECT_EQ(ARCHIVE_OK, archive_write_free(writer));
  EXPECT_EQ("log: é", Text(Read(&ReadArchive, std::string(bytes, used), "gz")));
  EXPECT_EQ("damaged", Text(Read(&ReadArchive, "no archive", "tar"), "_KOVAExtractError"));
}

TEST(ArchiveTest, WhatExpandsToTooMuchIsStopped) {
  const std::string bomb = Archive(&archive_write_set_format_ustar, &archive_write_add_filter_gzip, 50 << 20);
  const Json::Value document = Read(&ReadArchive, bomb, "tar.gz");
  EXPECT_EQ("expands to too much", Text(document, "_KOVAExtractError"));
  EXPECT_EQ("folder/first.txt\nzeros\n", Text(document));
  const std::string plain = Archive(&archive_write_set_format_ustar, &archive_write_add_filter_none, 1 << 20);
  EXPECT_EQ(kNames, Text(Read(&ReadArchive, plain, "tar")));
}

}  // namespace ferrox::extract::test
