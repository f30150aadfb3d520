#include "services/kovaelasticd/text/schema.h"

#include <algorithm>
#include <iterator>

#include "common/json_util.h"
#include "common/log.h"

namespace ferrox::engine {

namespace {

namespace names = fileindex::elastic;

/// Found by their own means, or of no use to anybody who searches.
constexpr const char* kNotPlain[] = {field::kPath,
                                     field::kParent,
                                     field::kFsName,
                                     field::kSearchName,
                                     field::kDisplayName,
                                     field::kKind,
                                     field::kTextContent,
                                     names::kKOVAMDContentType,
                                     names::kKOVAMDContentTypeTree};
// Facts about a file with conditions of their own (path:, size:, date:), or numbers that nobody types.
constexpr const char* kNotSearchable[] = {field::kPath,
                                          field::kParent,
                                          field::kFsName,
                                          field::kSearchName,
                                          field::kDisplayName,
                                          field::kKind,
                                          field::kExtension,
                                          field::kIsDir,
                                          field::kSize,
                                          field::kContentChangeDate,
                                          field::kTextContent,
                                          names::kKOVAMDAttributeChangeDate,
                                          names::kKOVAMDFSCreationDate,
                                          names::kKOVAMDContentModificationDate,
                                          names::kKOVAMDContentCreationDate,
                                          names::kKOVAMDLastUsedDate,
                                          names::kKOVAMDFinderOpenDate,
                                          names::kKOVAMDDateAdded,
                                          names::kKOVAMDLogicalSize,
                                          names::kKOVAMDPhysicalSize,
                                          names::kKOVAMDPrivilege};

// Each of these adds a word to every document that has it (RangeWord).
constexpr const char* kRanged[] = {
    names::kKOVAMDDurationSecond, names::kKOVAMDRecordingYear,   names::kKOVAMDContentCreationDate,
    names::kKOVAMDNumberOfPages,  names::kKOVAMDPixelWidth,      names::kKOVAMDPixelHeight,
    names::kKOVAMDISOSpeed,       names::kKOVAMDAudioTrackNumber};

template <size_t Count>
bool IsOneOf(const char* const (&names)[Count], const std::string& name) {
  return std::find(std::begin(names), std::end(names), name) != std::end(names);
}

/// Fields that begin with "_KOVA" are for programs, except those of the schema.
bool IsInternal(const std::string& name) {
  return name.compare(0, 5, "_KOVA") == 0 && name.compare(0, 7, "_KOVAMD") != 0;
}

bool IsTextOrTexts(const Json::Value& value) {
  if (value.isString()) return true;
  return value.isArray() && std::all_of(value.begin(), value.end(), [](const Json::Value& v) { return v.isString(); });
}

}  // namespace

Schema::Schema(const Json::Value& mappings) : mappings_(mappings) {
  const bool usable = mappings.isNull() || (mappings.isObject() && IsJsonObject(mappings["properties"]));
  FERROX_FAIL_IF(!usable, Error::kEngineBadRequest,
                 "\"mappings\" must be an object whose \"properties\" are an object");
  if (mappings.isNull()) return;
  default_ = ReadField("default", mappings["default"], Field());
  default_.type = Type::kAny;  // a field that is not listed may hold anything
  const Json::Value& properties = mappings["properties"];
  for (const std::string& name : properties.getMemberNames()) {
    fields_[name] = ReadField(name, properties[name], default_);
  }
}

Schema::Field Schema::ReadField(const std::string& name, const Json::Value& attributes, const Field& defaults) {
  FERROX_FAIL_IF(!IsJsonObject(attributes), Error::kEngineBadRequest,
                 "the mappings of \"" + name + "\" must be an object");
  Field result = defaults;
  std::string type;
  GetJsonValue(type, attributes, "type", false);
  GetJsonValue(result.plain, attributes, "_all", false);
  if (type.empty()) return result;
  const bool known = type == "string" || type == "text" || type == "int" || type == "double" || type == "bool";
  FERROX_FAIL_IF(!known, Error::kEngineBadRequest,
                 "the mappings of \"" + name + "\" name an unknown type \"" + type +
                     "\"; known are string, text, int, double and bool");
  result.type = type == "int"      ? Type::kInt
                : type == "double" ? Type::kDouble
                : type == "bool"   ? Type::kBool
                : type == "text"   ? Type::kText
                                   : Type::kAny;
  return result;
}

void Schema::Check(const Json::Value& document) const {
  for (auto member = document.begin(); member != document.end(); ++member) {
    const auto found = fields_.find(member.name());
    if (found == fields_.end() || member->isNull()) continue;
    const Type type = found->second.type;
    const bool fits = type == Type::kAny || (type == Type::kText && IsTextOrTexts(*member)) ||
                      (type == Type::kInt && member->isInt64()) || (type == Type::kDouble && member->isNumeric()) ||
                      (type == Type::kBool && member->isBool());
    FERROX_FAIL_IF(!fits, Error::kEngineBadRequest,
                   "field \"" + member.name() + "\" has not the type of the index's mappings");
  }
}

bool Schema::IsPlain(const std::string& name) const {
  if (IsInternal(name) || IsOneOf(kNotPlain, name)) return false;
  const auto found = fields_.find(name);
  const Field& known = found != fields_.end() ? found->second : default_;
  return known.plain && (known.type == Type::kAny || known.type == Type::kText);
}

bool Schema::IsSearchable(const std::string& name) { return !IsInternal(name) && !IsOneOf(kNotSearchable, name); }

bool Schema::IsRanged(const std::string& name) { return IsOneOf(kRanged, name); }

}  // namespace ferrox::engine
