// kovacontentworker-photo: the reader of pictures, whose library is under the GPL.

#include "services/kovacontentextractd/readers/photo/photo.h"

#include "services/kovacontentextractd/readers/converters.h"
#include "services/kovacontentextractd/worker.h"

using namespace ferrox::extract;

int main(int argc, char** argv) {
  static constexpr ReaderRow kReader = {"photo", &ReadPhoto};
  const auto prepare = [] {
    PreparePhoto();
    LoadConverters();
  };
  return RunWorker({&kReader, 1, prepare}, argc > 1 ? argv[1] : nullptr);
}
