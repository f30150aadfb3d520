#pragma once

#include <string>
#include <string_view>

namespace ferrox::engine {

/// Appends a part of a document's text such that it can be shown on one line: every run of blanks and control
/// characters is one blank, a byte that is no UTF-8 the replacement character. Marks that turn the direction of writing
/// count as control characters: they would turn what is printed behind.
void AppendClean(std::string& out, std::string_view text);

}  // namespace ferrox::engine
