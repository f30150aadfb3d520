#pragma once

#include <cstdint>
#include <string_view>

namespace ferrox::extract {

/// The character of a named reference of HTML ("eacute"), 0 when the name is not known. Names count with their case:
/// "Eacute" is another character. The table is html_entities.inc.
uint32_t HtmlEntity(std::string_view name);

}  // namespace ferrox::extract
