#pragma once

#include <string>
#include <string_view>

/// The C library's converters between encodings, by the names that it knows ("WINDOWS-1252"). Each is a shared object
/// of its own, which is loaded with the first use: not possible any more within the sandbox, so that what readers need
/// is loaded and held before it closes.
namespace ferrox::extract {

/// Converts to UTF-8. What is not valid becomes U+FFFD; false when that is more than one byte in a hundred, or there is
/// no such encoding. A character cut off at the end is dropped when `cut`.
bool ConvertToUtf8(std::string_view bytes, const std::string& encoding, bool cut, std::string& text);

/// Loads a converter of the C library and holds it for good: one that nobody holds is unloaded, also for libraries that
/// convert by themselves.
void HoldConverter(const char* from, const char* to);
/// Loads the converters of the encodings in use; after it they need no file any more.
void LoadConverters();

}  // namespace ferrox::extract
