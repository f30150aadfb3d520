#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace ferrox::engine {

/// A field's name before its value.
struct FieldStart {
  std::string name;
  size_t value = 0;     ///< where the value begins, in bytes of the query
  std::string sign;     ///< "<", ">", "<=" or ">=" that stands before it without a ":"
  bool certain = true;  ///< false: it is text after all where the value does not fit
};

/// The field that a condition at `begin` is about. "name:value", "name: value" unless the name has a capital or the
/// query several lines, as the head of a pasted mail has ("Size: >1M" at the front is one all the same); "name>value"
/// and "name=value" of numbers, sizes and dates, with or without blanks. Nothing for any other name, since pasted texts
/// have colons: "https://x", "10:30", "std::vector", "Re: x".
std::optional<FieldStart> FieldAt(std::string_view query, size_t begin);

}  // namespace ferrox::engine
