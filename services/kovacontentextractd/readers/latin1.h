#pragma once

#include <string>
#include <string_view>

namespace ferrox::extract {

/// Bytes whose encoding nothing tells, as UTF-8: unchanged where they are that, else read as Latin-1.
std::string Utf8OrLatin1(std::string_view bytes);

/// Undoes that somebody took UTF-8 for Latin-1: many programs write UTF-8 into fields that have no encoding.
std::string WithoutDoubleEncoding(std::string text);

}  // namespace ferrox::extract
