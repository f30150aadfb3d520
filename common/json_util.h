#pragma once

#include <string>
#include <vector>

#include <json/value.h>

#include "common/export.h"

/// Typed reading of JSON with uniform error texts, partial updates, and whole-text and whole-file conversion.
/// May be called by several threads at once for values of their own; parsers and writers are kept per thread.
/// No exception of the JSON library leaves any of these functions but asJsonType, and that only where isJsonType does
/// not hold. Nothing here blocks but the two functions for files.
///
/// Reading a request goes like this; each failure is in the log, and thrown, with the same words everywhere:
///   std::string share;
///   int limit = 100;
///   ferrox::GetJsonValue(share, request, "share", true);   // required: throws when it is missing
///   ferrox::GetJsonValue(limit, request, "limit", false);  // optional: stays 100
namespace ferrox {

/// Parses one JSON value that makes up the whole text; blanks around it are allowed. False, with `value` null, for
/// anything else: also for text after the value, nesting deeper than 1000, and comments, except where the JSON library
/// passes over them: in an object before and behind a member, in an array behind an element.
FERROX_EXPORT bool fromString(Json::Value& value, const std::string& text);
/// The value as one line without a newline. UTF-8, and any other byte, stays as it is.
/// @throws std::bad_alloc rather than return a part of the text.
FERROX_EXPORT std::string toString(const Json::Value& value);
/// Reads a regular JSON file; a FIFO is not waited for. False, with `value` null, when it cannot be read or parsed.
/// Nothing is logged: whether a missing file is a failure, the caller knows.
FERROX_EXPORT bool fromFile(Json::Value& value, const std::string& path);
/// Writes a JSON file as one line, the old file or the new one at any moment; false, with errno set, on failure.
/// Blocks until the disk has it (WriteWholeFile in common/file_util.h, whose rule for several writers holds here).
FERROX_EXPORT bool toFile(const Json::Value& value, const std::string& path);

/// Whether `value` is an object; a null value counts as an empty one.
inline bool IsJsonObject(const Json::Value& value) { return value.isObject() || value.isNull(); }
/// Whether `value` is an array; a null value counts as an empty one.
inline bool IsJsonArray(const Json::Value& value) { return value.isArray() || value.isNull(); }

/// Whether `value` can be read as a `T`, and the reading. For std::string, bool, int, unsigned int, long long, double.
/// long long takes integers only, the others whatever the JSON library converts without loss of range:
///   std::string        a string, a number or bool (as its text), null (as "")
///   bool               a bool, a number (false for 0), null (as false)
///   int, unsigned int  a number in the type's range (without its fraction), a bool (0 or 1), null (as 0)
///   double             a number, a bool (0 or 1), null (as 0)
///   long long          an integer from -2^63 to 2^63 - 1
/// A string is never read as a number or a bool, and neither an object nor an array as any of these.
template <typename T>
bool isJsonType(const Json::Value& value);
/// The value read as a `T`, by the table above. Call only where isJsonType holds: elsewhere the JSON library throws or
/// converts.
template <typename T>
T asJsonType(const Json::Value& value);

/// ", data=", the value in the JSON library's styled form and a newline, for error texts. The styled form is cut at
/// 64 KiB, "..." then follows: nested deep, a value has one many times its own size.
FERROX_EXPORT std::string AppendData(const Json::Value& value);

/// Reads the member `key` of `object` into `out`; for the types above and Json::Value (of any type). A null `object`
/// counts as empty. An optional member that is missing or of another type leaves `out` as it was. A member that is
/// there and null is not missing: it is read as the table above says.
/// @throws Error kBadArgument, with the whole object in its text: "Not an object"; for a required member
/// "Missing property: <key>" or, whatever `T` is, "Not a string". `out` is then as it was. What is thrown is a
/// SubjectError of the kind kJson (common/subject_error.h), whose name is these words without the data.
template <typename T>
void GetJsonValue(T& out, const Json::Value& object, const std::string& key, bool required);

/// Merges the object `changes` into `target`: null removes a member, an object merges key by key to any depth (and
/// replaces what is no object), anything else replaces. What is not an object changes nothing. `changes` must not be a
/// part of `target`. For example {"a": null, "b": {"d": 3}} makes {"b": {"c": 2, "d": 3}} of {"a": 1, "b": {"c": 2}}.
FERROX_EXPORT void JsonApplyChanges(Json::Value& target, const Json::Value& changes);

/// An array of the elements in order, never null. For std::string.
template <typename T>
Json::Value Vec2JsonArr(const std::vector<T>& elements);
/// The elements of an array that can be read as `T`, in order; the others are left out. Empty for what is no array.
/// For std::string, so that numbers, bools and null count, too.
template <typename T>
std::vector<T> JsonArr2Vec(const Json::Value& array);

// What the library has of the templates above. Another type compiles, and fails when the program is linked.
template <>
FERROX_EXPORT bool isJsonType<std::string>(const Json::Value& value);
template <>
FERROX_EXPORT bool isJsonType<bool>(const Json::Value& value);
template <>
FERROX_EXPORT bool isJsonType<int>(const Json::Value& value);
template <>
FERROX_EXPORT bool isJsonType<unsigned int>(const Json::Value& value);
template <>
FERROX_EXPORT bool isJsonType<long long>(const Json::Value& value);
template <>
FERROX_EXPORT bool isJsonType<double>(const Json::Value& value);

template <>
FERROX_EXPORT std::string asJsonType<std::string>(const Json::Value& value);
template <>
FERROX_EXPORT bool asJsonType<bool>(const Json::Value& value);
template <>
FERROX_EXPORT int asJsonType<int>(const Json::Value& value);
template <>
FERROX_EXPORT unsigned int asJsonType<unsigned int>(const Json::Value& value);
template <>
FERROX_EXPORT long long asJsonType<long long>(const Json::Value& value);
template <>
FERROX_EXPORT double asJsonType<double>(const Json::Value& value);

extern template FERROX_EXPORT void GetJsonValue(std::string&, const Json::Value&, const std::string&, bool);
extern template FERROX_EXPORT void GetJsonValue(bool&, const Json::Value&, const std::string&, bool);
extern template FERROX_EXPORT void GetJsonValue(int&, const Json::Value&, const std::string&, bool);
extern template FERROX_EXPORT void GetJsonValue(unsigned int&, const Json::Value&, const std::string&, bool);
extern template FERROX_EXPORT void GetJsonValue(long long&, const Json::Value&, const std::string&, bool);
extern template FERROX_EXPORT void GetJsonValue(double&, const Json::Value&, const std::string&, bool);
// Takes the member as it is, of any type and null, too: "Not a string" is never thrown.
template <>
FERROX_EXPORT void GetJsonValue(Json::Value& out, const Json::Value& object, const std::string& key, bool required);

template <>
FERROX_EXPORT Json::Value Vec2JsonArr(const std::vector<std::string>& elements);
template <>
FERROX_EXPORT std::vector<std::string> JsonArr2Vec(const Json::Value& array);

}  // namespace ferrox
