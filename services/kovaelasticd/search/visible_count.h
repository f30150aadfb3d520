#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include "services/kovaelasticd/search/word_forms.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// How many visible documents have a folded word in their text, name or title. Some 60 us, and 0.1 for each document
/// that has it, visible or not; these are added to `hits`. @throws Error kEngineStorage.
int64_t CountVisible(Database& database, const Visible& visible, const std::string& word, size_t& hits);

/// Whether a visible document has what the form stands for; ends with the first. @throws Error kEngineStorage.
bool AnyVisible(Database& database, const Visible& visible, const WordForm& form);

}  // namespace ferrox::engine
