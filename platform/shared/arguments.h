#pragma once

#include <cstdarg>
#include <string>
#include <vector>

namespace kova {

/// The texts of a variable argument list that ends with a null `char*`, `first` before them.
inline std::vector<std::string> CollectArguments(const char* first, va_list more) {
  std::vector<std::string> arguments;
  for (const char* argument = first; argument != nullptr; argument = va_arg(more, const char*)) {
    arguments.emplace_back(argument);
  }
  return arguments;
}

}  // namespace kova
