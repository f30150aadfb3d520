#pragma once

#include <string>
#include <string_view>

namespace ferrox::extract {

/// Bytes of unknown encoding, as UTF-8: unchanged where they are that, else read as Latin-1.
std::string Utf8OrLatin1(std::string_view bytes);

/// Undoes that somebody took UTF-8 for Latin-1: many programs write UTF-8 into fields that have no encoding.
std::string WithoutDoubleEncoding(std::string text);

/// The encoding of texts that were taken for Latin-1 but have too few plain letters for it: Cyrillic and East Asian
/// ones that programs wrote into fields without encoding. Empty when they may be Latin-1. All texts of one file
/// together tell more than each alone.
std::string TrueEncoding(std::string_view texts);
/// The text that was taken for Latin-1, in the encoding that TrueEncoding returned; what is not Latin-1 stays.
std::string InTrueEncoding(std::string text, const std::string& encoding);

}  // namespace ferrox::extract
