// kovacontentworker: the readers that need no library under the GPL, and none that takes long to load.

#include <iterator>

#include "services/kovacontentextractd/readers/archive.h"
#include "services/kovacontentextractd/readers/audio.h"
#include "services/kovacontentextractd/readers/electronic_book.h"
#include "services/kovacontentextractd/readers/office_open.h"
#include "services/kovacontentextractd/readers/old_office.h"
#include "services/kovacontentextractd/readers/open_document.h"
#include "services/kovacontentextractd/readers/rich_text.h"
#include "services/kovacontentextractd/readers/text_files.h"
#include "services/kovacontentextractd/worker.h"

using namespace ferrox::extract;

int main(int argc, char** argv) {
  static constexpr ReaderRow kReaders[] = {
      {"plain", &ReadPlainFile},     {"html", &ReadHtmlFile},        {"xml", &ReadXmlFile},
      {"unknown", &ReadUnknownFile}, {"office", &ReadOfficeOpen},    {"open-document", &ReadOpenDocument},
      {"book", &ReadElectronicBook}, {"old-office", &ReadOldOffice}, {"rich-text", &ReadRichText},
      {"archive", &ReadArchive},     {"audio", &ReadAudio},
  };
  const auto prepare = [] {
    PrepareTextReaders();
    PrepareArchive();
    PrepareAudio();
  };
  return RunWorker({kReaders, std::size(kReaders), prepare}, argc > 1 ? argv[1] : nullptr);
}
