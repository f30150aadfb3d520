#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// The order of completions: words that two names or titles have, or more, before others; then by documents.
bool IsBetter(const Completion& a, const Completion& b);

/// Words of visible documents that begin with `begin`, a folded word of two letters or more: at most `limit`, the best
/// first. Words of texts only where few words begin
/// so, and where two documents have them. Words have four letters or more. Where looking through all of them is too
/// much work, there are none: how far it came would tell of the words of others. @throws Error kEngineStorage.
std::vector<Completion> CompleteWord(StoreReader& reader, const Visible& visible, const std::string& begin,
                                     size_t limit);

}  // namespace ferrox::engine
