// kovacontentworker-pdf: the reader of PDF, whose library is under the GPL.

#include "services/kovacontentextractd/readers/pdf/pdf.h"

#include "services/kovacontentextractd/worker.h"

using namespace ferrox::extract;

int main(int argc, char** argv) {
  static constexpr ReaderRow kReader = {"pdf", &ReadPdf};
  return RunWorker({&kReader, 1, &PreparePdf}, argc > 1 ? argv[1] : nullptr);
}
