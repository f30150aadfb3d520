#pragma once

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"
#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

/// The visible documents that lie below folders in whose own names the words stand one behind the other, or
/// a single one by its stem. Whether a folder itself is visible does not matter: its name is part of the paths below
/// it. The folder that holds all that is indexed does not count, nor what is above it, since it tells no documents
/// apart. For the same reason nothing is found where it would be more than a quarter of the visible documents, and more
/// than a few. In a file of an older format nothing is found. @throws Error kEngineStorage.
DocSet DocumentsInFoldersNamed(StoreReader& reader, const Visible& visible, const QueryWords& words);

}  // namespace ferrox::engine
