#include "common/json_util.h"

#include <algorithm>
#include <cerrno>
#include <limits>
#include <memory>
#include <ostream>
#include <streambuf>
#include <utility>

#include <json/writer.h>

#include "base/json.h"
#include "common/file_util.h"
#include "common/log.h"

namespace ferrox {

namespace {

/// A hostile document, nested deep, has a styled form many times its own size.
constexpr size_t kAppendedMaxBytes = 64 * 1024;

/// Keeps what is written up to a limit, and drops the rest.
class CappedBuffer : public std::streambuf {
 public:
  explicit CappedBuffer(size_t limit_bytes) : limit_bytes_(limit_bytes) {}
  std::string Text() const { return cut_ ? text_ + "..." : text_; }
  std::string Take() { return std::move(text_); }

 protected:
  std::streamsize xsputn(const char* data, std::streamsize size) override {
    const size_t kept = std::min(static_cast<size_t>(size), limit_bytes_ - text_.size());
    text_.append(data, kept);
    cut_ = cut_ || kept < static_cast<size_t>(size);
    return size;
  }
  int_type overflow(int_type c) override {
    const char byte = traits_type::to_char_type(c);
    if (!traits_type::eq_int_type(c, traits_type::eof())) (void)xsputn(&byte, 1);
    return traits_type::not_eof(c);
  }

 private:
  size_t limit_bytes_;
  std::string text_;
  bool cut_ = false;
};

Json::StreamWriterBuilder WriterBuilder(const char* indentation) {
  Json::StreamWriterBuilder builder;
  builder["commentStyle"] = "None";
  builder["indentation"] = indentation;
  builder["emitUTF8"] = true;
  return builder;
}

[[noreturn]] void FailReading(const char* condition, int line, const std::string& reason, const Json::Value& object) {
  Fail({FERROX_SOURCE, line, "GetJsonValue", condition}, errno, Error::kBadArgument, reason + AppendData(object),
       {Subject::kJson, reason});
}

/// The member of that name, or null when `object` has none.
/// @throws Error kBadArgument when `object` is not one, or lacks a required member.
const Json::Value* FindMember(const Json::Value& object, const std::string& key, bool required) {
  if (!IsJsonObject(object)) FailReading("!obj.isObject()", __LINE__, "Not an object", object);
  const Json::Value* member = object.find(key.data(), key.data() + key.size());
  if (member == nullptr && required) {
    FailReading("!obj.isMember(key)", __LINE__, "Missing property: " + key, object);
  }
  return member;
}

}  // namespace

bool fromString(Json::Value& value, const std::string& text) {
  return base::ParseJson(text, base::JsonRules::kAnyValue, value);
}

/// A stream would take a text that memory was too short for as written, and a part of it would pass for the whole.
std::string toString(const Json::Value& value) {
  thread_local const std::unique_ptr<Json::StreamWriter> writer(WriterBuilder("").newStreamWriter());
  CappedBuffer buffer(std::numeric_limits<size_t>::max());
  std::ostream stream(&buffer);
  stream.exceptions(std::ios::badbit);
  (void)writer->write(value, &stream);
  return buffer.Take();
}

bool fromFile(Json::Value& value, const std::string& path) {
  return base::ReadJsonFile(path, base::JsonRules::kAnyValue, value);
}

bool toFile(const Json::Value& value, const std::string& path) { return WriteWholeFile(path, toString(value) + "\n"); }

template <>
bool isJsonType<std::string>(const Json::Value& value) {
  return value.isConvertibleTo(Json::stringValue);
}
template <>
bool isJsonType<bool>(const Json::Value& value) {
  return value.isConvertibleTo(Json::booleanValue);
}
template <>
bool isJsonType<int>(const Json::Value& value) {
  return value.isConvertibleTo(Json::intValue);
}
template <>
bool isJsonType<unsigned int>(const Json::Value& value) {
  return value.isConvertibleTo(Json::uintValue);
}
template <>
bool isJsonType<long long>(const Json::Value& value) {
  // An unsigned value beyond the signed range cannot be read as one.
  return (value.type() == Json::intValue || value.type() == Json::uintValue) && value.isInt64();
}
template <>
bool isJsonType<double>(const Json::Value& value) {
  return value.isConvertibleTo(Json::realValue);
}

template <>
std::string asJsonType<std::string>(const Json::Value& value) {
  return value.asString();
}
template <>
bool asJsonType<bool>(const Json::Value& value) {
  return value.asBool();
}
template <>
int asJsonType<int>(const Json::Value& value) {
  return value.asInt();
}
template <>
unsigned int asJsonType<unsigned int>(const Json::Value& value) {
  return value.asUInt();
}
template <>
long long asJsonType<long long>(const Json::Value& value) {
  return value.asInt64();
}
template <>
double asJsonType<double>(const Json::Value& value) {
  return value.asDouble();
}

std::string AppendData(const Json::Value& value) {
  const std::unique_ptr<Json::StreamWriter> writer(WriterBuilder("\t").newStreamWriter());
  CappedBuffer buffer(kAppendedMaxBytes);
  std::ostream stream(&buffer);
  (void)writer->write(value, &stream);
  return ", data=" + buffer.Text() + "\n";
}

template <typename T>
void GetJsonValue(T& out, const Json::Value& object, const std::string& key, bool required) {
  const Json::Value* member = FindMember(object, key, required);
  if (member == nullptr) return;
  if (isJsonType<T>(*member)) {
    out = asJsonType<T>(*member);
  } else if (required) {
    // Deliberate: the same words for every type.
    FailReading("!isJsonType<T>(obj[key])", __LINE__, "Not a string", object);
  }
}

template void GetJsonValue(std::string&, const Json::Value&, const std::string&, bool);
template void GetJsonValue(bool&, const Json::Value&, const std::string&, bool);
template void GetJsonValue(int&, const Json::Value&, const std::string&, bool);
template void GetJsonValue(unsigned int&, const Json::Value&, const std::string&, bool);
template void GetJsonValue(long long&, const Json::Value&, const std::string&, bool);
template void GetJsonValue(double&, const Json::Value&, const std::string&, bool);

template <>
void GetJsonValue(Json::Value& out, const Json::Value& object, const std::string& key, bool required) {
  const Json::Value* member = FindMember(object, key, required);
  if (member != nullptr) out = Json::Value(*member);
}

void JsonApplyChanges(Json::Value& target, const Json::Value& changes) {
  if (!changes.isObject()) return;
  if (!target.isObject()) target = Json::Value(Json::objectValue);
  for (const std::string& key : changes.getMemberNames()) {
    const Json::Value& change = changes[key];
    if (change.isNull()) {
      target.removeMember(key);
    } else if (change.isObject()) {
      JsonApplyChanges(target[key], change);
    } else {
      target[key] = change;
    }
  }
}

template <>
Json::Value Vec2JsonArr(const std::vector<std::string>& elements) {
  Json::Value array(Json::arrayValue);
  for (const std::string& element : elements) array.append(element);
  return array;
}

template <>
std::vector<std::string> JsonArr2Vec(const Json::Value& array) {
  std::vector<std::string> elements;
  if (!array.isArray()) return elements;
  for (const Json::Value& element : array) {
    if (isJsonType<std::string>(element)) elements.push_back(asJsonType<std::string>(element));
  }
  return elements;
}

}  // namespace ferrox
