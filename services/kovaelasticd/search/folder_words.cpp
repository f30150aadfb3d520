#include "services/kovaelasticd/search/folder_words.h"

namespace ferrox::engine {

DocSet DocumentsInFoldersNamed(StoreReader& /*reader*/, const Visible& /*visible*/, const std::string& /*expression*/,
                               bool /*prefix*/) {
  return {};
}

}  // namespace ferrox::engine
