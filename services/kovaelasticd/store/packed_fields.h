#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include <json/value.h>

namespace ferrox::engine {

// The fields of a document that have no column of their own, in one text (docs.packed): for each one its number in the
// table "fields" and its value. Numbers are written 7 bits at a time, the lowest first, with bit 7 set on all bytes but
// the last; signed ones with the sign in bit 0 (zigzag), so that small negative numbers are short. A value is a byte of
// Tag and, for texts, arrays and objects (as JSON text) and floating-point numbers, length and bytes.

/// Appends a field.
void AddField(std::string& packed, int64_t number, const Json::Value& value);
/// Gives the field `number` another value where it stands; appends it where there is none.
void ReplaceField(std::string& packed, int64_t number, const Json::Value& value);
/// The value of the field `number` when it is a text; a part of `packed`.
std::optional<std::string_view> TextField(std::string_view packed, int64_t number);

/// Goes through packed fields. Bytes that AddField cannot have written end it.
class PackedFields {
 public:
  /// The first byte of a packed value. Stored: the numbers never change.
  enum class Tag : char { kNull, kFalse, kTrue, kInt, kText, kJson };

  /// `packed` must outlive this.
  explicit PackedFields(std::string_view packed) : packed_(packed) {}

  /// Goes to the next field; false behind the last.
  bool Next();

  // The field at hand, after a Next that returned true.
  int64_t Number() const { return number_; }
  Tag Kind() const { return tag_; }
  Json::Value Value() const;
  bool IsText() const { return tag_ == Tag::kText; }
  std::string_view Text() const {
    return text_;
  }                                        ///< of a text, or of the JSON text that an array or object is kept as
  int64_t Int() const { return int_; }     ///< of a whole number
  size_t Begin() const { return begin_; }  ///< where it stands in `packed`
  size_t End() const { return at_; }

 private:
  uint64_t ReadNumber();

  const std::string_view packed_;
  size_t at_ = 0;
  size_t begin_ = 0;
  int64_t number_ = 0;
  Tag tag_ = Tag::kNull;
  int64_t int_ = 0;
  std::string_view text_;
};

}  // namespace ferrox::engine
