// All readers of files: any bytes give valid UTF-8 within the limits. The first line
// names the reader. What a library does to its memory is found here too.

#include <sys/mman.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "services/kovacontentextractd/readers/archive.h"
#include "services/kovacontentextractd/readers/audio.h"
#include "services/kovacontentextractd/readers/electronic_book.h"
#include "services/kovacontentextractd/readers/mail.h"
#include "services/kovacontentextractd/readers/office_open.h"
#include "services/kovacontentextractd/readers/old_office.h"
#include "services/kovacontentextractd/readers/open_document.h"
#include "services/kovacontentextractd/readers/pdf/pdf.h"
#include "services/kovacontentextractd/readers/pdf/xmp_packet.h"
#include "services/kovacontentextractd/readers/photo/photo.h"
#include "services/kovacontentextractd/readers/rich_text.h"
#include "services/kovacontentextractd/readers/text_files.h"
#include "services/kovacontentextractd/readers/utf8.h"
#include "services/kovacontentextractd/readers/video/video.h"

using namespace ferrox::extract;

namespace {

void Require(bool condition) {
  if (!condition) abort();
}

void ReadPacket(const Source& source, Findings& findings) {
  std::string packet(source.size, '\0');
  Require(pread(source.fd, packet.data(), packet.size(), 0) == static_cast<ssize_t>(packet.size()));
  AddXmpPacket(packet, findings);
}

struct Row {
  std::string_view name;
  Reader reader;
};
constexpr Row kReaders[] = {
    {"old-office", &ReadOldOffice}, {"rich-text", &ReadRichText},
    {"office", &ReadOfficeOpen},    {"open-document", &ReadOpenDocument},
    {"book", &ReadElectronicBook},  {"mail", &ReadMail},
    {"archive", &ReadArchive},      {"audio", &ReadAudio},
    {"xmp", &ReadPacket},           {"plain", &ReadPlainFile},
    {"html", &ReadHtmlFile},        {"xml", &ReadXmlFile},
    {"unknown", &ReadUnknownFile},  {"pdf", &ReadPdf},
    {"photo", &ReadPhoto},          {"video", &ReadVideo},
};

Reader ReaderNamed(std::string_view name) {
  for (const Row& row : kReaders) {
    if (row.name == name) return row.reader;
  }
  return nullptr;
}

void Check(const Findings& findings) {
  const Json::Value fields = findings.ToFields();
  Require(findings.Text().size() <= findings.Bounds().text_bytes);
  Require(ValidUtf8Prefix(findings.Text()) == findings.Text().size());
  for (const Json::Value& value : fields) {
    const std::string text = value.asString();
    Require(ValidUtf8Prefix(text) == text.size());
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string_view input(reinterpret_cast<const char*>(data), size);
  const size_t line = input.find('\n');
  const Reader reader = line < input.size() ? ReaderNamed(input.substr(0, line)) : nullptr;
  if (reader == nullptr) return -1;
  const std::string_view bytes = input.substr(line + 1);
  const int fd = memfd_create("input", MFD_CLOEXEC);
  Require(write(fd, bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size()));
  Findings findings;
  reader({fd, bytes.size(), "input", "input"}, findings);
  Check(findings);
  Require(close(fd) == 0);
  return 0;
}
