#pragma once

#include <cstdint>
#include <string>

#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/store_reader.h"

namespace ferrox::engine {

/// The figures of the index that `readers` read, as of its last commit. @throws Error kEngineStorage, IndexDamaged.
StoreStat ReadStat(ReaderPool& readers);

/// What a file takes on its volume; 0 when it is not there.
int64_t BytesOnDisk(const std::string& path);

}  // namespace ferrox::engine
