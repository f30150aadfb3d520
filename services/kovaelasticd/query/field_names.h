#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace ferrox::engine {

// The names that can stand before a ":". Those that people write are read in capitals, too; full names ("KOVAMDAlbum")
// are not.

/// What a name stands for, apart from fields that are searched by words or ranges.
enum class ConditionType { kNone, kName, kKind, kExt, kPath, kSize, kDate, kBefore, kAfter, kType, kHas };
ConditionType ConditionTypeOf(std::string_view name);

/// The document fields that a friendly name stands for; empty when it is none.
std::vector<std::string> FriendlyFields(std::string_view name);

/// The other way round: the first name that people write that stands for just these fields; of others the name of the
/// first field itself. `fields` must not be empty.
std::string NameOfFields(const std::vector<std::string>& fields);

/// Whether the name is a document field's own.
bool IsFullFieldName(std::string_view name);

/// Whether the value is a range, which may be compared, and have blanks.
bool TakesRange(std::string_view name);

/// Whether the name is any that has a meaning before a ":".
bool IsFieldName(std::string_view name);

/// The name that people write of which `name`, which is none, is one slip of the keys away: a letter too many, missing,
/// another, or swapped with the next. "" for none.
std::string FieldMeantBy(std::string_view name);

}  // namespace ferrox::engine
