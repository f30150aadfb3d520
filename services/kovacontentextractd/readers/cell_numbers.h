#pragma once

#include <string>
#include <string_view>

namespace ferrox::extract {

/// How a sheet shows a number, as far as it is followed here.
struct NumberFormat {
  enum Kind { kGeneral, kFixed, kDate };
  Kind kind = kGeneral;
  int decimals = 0;      ///< of kFixed, as the other two
  bool grouped = false;  ///< with a comma after each three digits
  bool percent = false;
};

/// Reads a format as people write it in the program. What it does with a number beyond what NumberFormat has is not
/// followed: such a number is kGeneral.
NumberFormat ParseNumberFormat(std::string_view code);
/// The format that programs have under this number without writing it down.
NumberFormat BuiltInNumberFormat(int id);

/// A number as it is, and behind it as the sheet shows it where that is something else, so that it is found by both.
/// Dates, which are days since 1900, or 1904, are written as 2024-03-01.
std::string NumberText(double value, const NumberFormat& format, bool from_1904);

}  // namespace ferrox::extract
