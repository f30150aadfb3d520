#pragma once

#include <string>
#include <string_view>

/// What kind of content a file has, by its name and its first bytes, and who reads it.
namespace kova::content {

/// The program that a reader is part of. Readers that need a library under the GPL, or one that takes long to load,
/// have one of their own.
enum class Program { kGeneral, kMail, kPdf, kPhoto, kVideo };
inline constexpr int kPrograms = 5;
/// The name of a program, as it is installed.
const char* ProgramName(Program program);
/// The folder of these programs, or where those that are not installed would be: FERROX_LIBEXEC, that of the program
/// that asks, or "../libexec" from there, whichever has the general one; "" when none has.
const std::string& ProgramFolder();

struct Format {
  std::string_view type;
  const char* reader;  ///< what its program calls it
  Program program;
  /// Raised when the reader has learnt so much that files which it failed at are to be read again.
  int version;
};

/// By an extension in lower case, without its dot; null for one that is not known.
const char* TypeByExtension(std::string_view extension);
/// The type that some extension has and whose name `text` begins with; null when there is none.
const char* TypeAtBeginning(std::string_view text);
/// How many of a file's first bytes tell its type.
inline constexpr size_t kHeadBytes = 4096;
/// By name and first bytes: what the name says, unless the bytes are those of something else. Null when neither tells.
const char* TypeOf(std::string_view extension, std::string_view head);

/// Who reads a type of content; null when nobody does. What is of no known type is read as kUnknown.
const Format* FormatOf(std::string_view type);
extern const Format kUnknown;

}  // namespace kova::content
