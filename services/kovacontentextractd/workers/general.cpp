// kovacontentworker: the readers that need no library under the GPL.

#include <iterator>

#include "services/kovacontentextractd/readers/text_files.h"
#include "services/kovacontentextractd/worker.h"

using namespace ferrox::extract;

int main(int argc, char** argv) {
  static constexpr ReaderRow kReaders[] = {
      {"plain", &ReadPlainFile},
      {"html", &ReadHtmlFile},
      {"xml", &ReadXmlFile},
      {"unknown", &ReadUnknownFile},
  };
  const Worker worker = {kReaders, std::size(kReaders), &PrepareTextReaders};
  return RunWorker(worker, argc > 1 ? argv[1] : nullptr);
}
