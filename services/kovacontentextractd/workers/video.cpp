// kovacontentworker-video: the reader of films, whose library takes long to load.

#include "services/kovacontentextractd/readers/video/video.h"

#include "services/kovacontentextractd/worker.h"

using namespace ferrox::extract;

int main(int argc, char** argv) {
  static constexpr ReaderRow kReader = {"video", &ReadVideo};
  return RunWorker({&kReader, 1, &PrepareVideo}, argc > 1 ? argv[1] : nullptr);
}
