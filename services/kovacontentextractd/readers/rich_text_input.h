#pragma once

#include <array>
#include <chrono>
#include <cstddef>
#include <string_view>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/cpu_budget.h"

namespace ferrox::extract {

/// The bytes of an RTF file, and what in them makes up a control word. Ends early when the processor time is spent.
class RichTextInput {
 public:
  /// A control word: of "\fs24", "fs" and 24.
  struct Word {
    std::string_view name;  ///< of a longer one, the first 32 letters; valid until the next one is read
    int number = 1;         ///< 1 where the file has none
  };

  RichTextInput(const Source& source, std::chrono::milliseconds cpu_max) : source_(source), budget_(cpu_max) {}

  /// The next byte; -1 at the end.
  int Get() {
    if (at_ == size_) Refill();
    return at_ < size_ ? static_cast<unsigned char>(buffer_[at_++]) : -1;
  }
  /// Gives back the byte that Get gave last, if it gave one.
  void Unget() { at_ -= size_ > 0 ? 1 : 0; }
  /// Takes what comes before the next brace, "\", or end of a line, or the part of it that is read; valid until the
  /// next call. Empty where one of them comes next.
  std::string_view GetText();
  /// Passes `count` bytes, none when it is not above 0.
  void Skip(int count);

  static bool BeginsWord(int c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z'); }
  /// Reads the rest of the word whose first letter is `first`, with the blank that ends it.
  Word ReadWord(int first);
  /// Reads the two hexadecimal digits behind "\'"; -1 when they are none.
  int ReadHexByte();

  bool TimeIsUp() const { return budget_.IsSpent(); }

 private:
  void Refill();

  FileSource source_;
  const CpuBudget budget_;
  std::array<char, 16384> buffer_;
  size_t at_ = 0, size_ = 0;
  std::array<char, 32> name_;  ///< of the word that was read last
};

}  // namespace ferrox::extract
