#pragma once

#include <string>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// The visible documents that lie below folders whose own name the full-text expression finds; `prefix` as in Collect.
/// The folder that holds all that is indexed does not count, nor what is above it. @throws Error kEngineStorage.
DocSet DocumentsInFoldersNamed(StoreReader& reader, const Visible& visible, const std::string& expression, bool prefix);

}  // namespace ferrox::engine
