#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace ferrox::extract {

/// References to characters, by what stands between "&" and ";".

/// The character of a named reference of HTML ("eacute"), 0 when the name is not known. Names count with their case:
/// "Eacute" is another character. The table is html_entities.inc.
uint32_t HtmlEntity(std::string_view name);

/// The character of one of the five names that XML has itself; 0 for others, which a document type would define.
uint32_t XmlEntity(std::string_view name);

/// The number in a reference that begins with "#" ("#233", "#xE9"); nothing where there is something else than digits.
/// A number that is beyond Unicode comes as 0x110000, and one without digits as 0; surrogates are not refused.
std::optional<uint32_t> ReferenceNumber(std::string_view name);

}  // namespace ferrox::extract
