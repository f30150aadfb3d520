#pragma once

#include <string>
#include <string_view>

namespace ferrox::extract {

/// Whether a spreadsheet shows numbers in this format, or in the built-in one of this number, as a date or a time.
bool IsDateFormat(std::string_view format);
bool IsBuiltInDateFormat(int id);

/// A number as a sheet shows it, as far as that takes no knowledge of its format. Dates are days since 1900, or 1904.
std::string NumberText(double value, bool is_date, bool from_1904);

}  // namespace ferrox::extract
