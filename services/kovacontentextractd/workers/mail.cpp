// kovacontentworker-mail: the reader of mail, whose library takes long to load.

#include "services/kovacontentextractd/readers/mail.h"

#include "services/kovacontentextractd/readers/text_files.h"
#include "services/kovacontentextractd/worker.h"

using namespace ferrox::extract;

int main(int argc, char** argv) {
  static constexpr ReaderRow kReader = {"mail", &ReadMail};
  const auto prepare = [] {
    PrepareTextReaders();
    PrepareMail();
  };
  return RunWorker({&kReader, 1, prepare}, argc > 1 ? argv[1] : nullptr);
}
