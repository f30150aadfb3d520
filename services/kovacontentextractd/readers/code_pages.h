#pragma once

#include <string>
#include <string_view>

namespace ferrox::extract {

/// Text in one of the code pages by whose numbers old office files name their encoding, as UTF-8. What the converters
/// do not know is read as Western.
std::string FromCodePage(std::string_view bytes, int code_page);

/// The code point of a byte in Windows-1252; the five bytes that it leaves open are the control characters of Latin-1.
uint32_t FromWindows1252(unsigned char byte);

/// UTF-16 with its low bytes first, as UTF-8; a byte too many is dropped.
std::string FromUtf16Little(std::string_view bytes);

}  // namespace ferrox::extract
