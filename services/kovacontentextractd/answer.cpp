#include "services/kovacontentextractd/answer.h"

#include <array>
#include <charconv>
#include <map>
#include <utility>

#include "common/json_scan.h"
#include "common/json_util.h"
#include "fileindex/elastic/elastic_control.h"
#include "services/kovacontentextractd/readers/reader.h"
#include "services/kovacontentextractd/readers/utf8.h"
#include "services/kovacontentextractd/worker_protocol.h"
#include "wire/fields.h"

namespace ferrox::extract {

namespace {

namespace elastic = fileindex::elastic;

/// Longer texts of fields are dropped: readers cut theirs at half of this.
constexpr size_t kFieldMaxBytes = 64U << 10;
constexpr size_t kNameMaxBytes = 1024;
/// Several times what all fields and attachments need: as a tree, an answer may be fifty times as large.
constexpr size_t kValuesMax = 4000;

/// What is known without the content, and so is not for it to say.
constexpr const char* kFacts[] = {elastic::kKOVAMDPath,
                                  elastic::kKOVAMDParent,
                                  elastic::kKOVAMDFSName,
                                  elastic::kKOVAMDSearchFileName,
                                  elastic::kKOVAMDDisplayName,
                                  elastic::kKOVAMDKind,
                                  elastic::kKOVAMDExtension,
                                  elastic::kKOVAMDIsDir,
                                  elastic::kKOVAMDOwnerUserID,
                                  elastic::kKOVAMDOwnerGroupID,
                                  elastic::kKOVAMDPrivilege,
                                  elastic::kKOVAMDFSSize,
                                  elastic::kKOVAMDLogicalSize,
                                  elastic::kKOVAMDPhysicalSize,
                                  elastic::kKOVAMDDateAdded,
                                  elastic::kKOVAMDFSContentChangeDate,
                                  elastic::kKOVAMDFSCreationDate,
                                  elastic::kKOVAMDAttributeChangeDate,
                                  elastic::kKOVAMDContentModificationDate,
                                  elastic::kKOVAMDWildcard,
                                  elastic::kKOVAMDTextContent};

/// The type of a field in the index, of which a worker's value is made.
enum class Type { kText, kInteger, kNumber, kBool };
using Types = std::map<std::string, Type>;

Type TypeNamed(const std::string& name) {
  if (name == "int") return Type::kInteger;
  if (name == "double") return Type::kNumber;
  return name == "bool" ? Type::kBool : Type::kText;
}

/// The fields that a worker may set.
Types MakeTypes() {
  const Json::Value mappings = elastic::GetFileIndexMappings();
  Types types = {{elastic::k_KOVATextCut, Type::kBool},
                 {elastic::k_KOVATextEncoding, Type::kText},
                 {elastic::k_KOVAExtractError, Type::kText}};
  for (const char* name : elastic::kFieldNames)
    types[name] = TypeNamed(mappings["properties"][name]["type"].asString());
  for (const char* name : kFacts) types.erase(name);
  return types;
}

/// The number with as few digits as tell it from its neighbours: 2.8, not 2.7999999999999998.
std::string Shortest(double number) {
  std::array<char, 32> text;
  const auto end = std::to_chars(text.data(), text.data() + text.size(), number).ptr;
  return {text.data(), end};
}

/// UTF-8 in the JSON text is not enough: an escape such as \udfff becomes bytes that are none.
bool IsFieldText(const std::string& text) {
  return text.size() <= kFieldMaxBytes && ValidUtf8Prefix(text) == text.size();
}

/// `value` as the index takes it; null when it is not of that type.
Json::Value OfType(Type type, const Json::Value& value) {
  if (type == Type::kBool) return value.isBool() ? value : Json::Value();
  if (type == Type::kInteger) return value.isInt64() ? Json::Value(value.asInt64()) : Json::Value();
  if (type == Type::kNumber) return value.isNumeric() ? Json::Value(value.asDouble()) : Json::Value();
  if (value.isDouble() && !value.isInt64()) return Shortest(value.asDouble());
  if (value.isNumeric()) return toString(value);
  return value.isString() && IsFieldText(value.asString()) ? value : Json::Value();
}

/// The attachments that are listed, up to the first one that cannot be.
std::vector<AttachedBytes> ListedAttachments(const Json::Value& list) {
  std::vector<AttachedBytes> attachments;
  uint32_t offset = kAttachmentsAt;
  for (Json::ArrayIndex i = 0; list.isArray() && i < list.size() && i < Limits().attachments; ++i) {
    const Json::Value& one = list[i];
    if (!one.isObject() || !one["name"].isString() || !one["bytes"].isUInt()) break;
    std::string name = one["name"].asString();
    if (name.size() > kNameMaxBytes || one["bytes"].asUInt() > kRegionBytes - offset) break;
    attachments.push_back({std::move(name), offset, one["bytes"].asUInt()});
    offset += attachments.back().bytes;
  }
  return attachments;
}

}  // namespace

bool ParseAnswer(const std::string& json, Json::Value& fields, std::vector<AttachedBytes>& attachments) {
  static const Types types = MakeTypes();
  Json::Value said;
  if (CountJsonValues(json) > kValuesMax) return false;
  if (ValidUtf8Prefix(json) != json.size() || !fromString(said, json) || !said.isObject()) return false;
  for (auto member = said.begin(); member != said.end(); ++member) {
    const auto known = types.find(member.name());
    if (known == types.end()) continue;
    Json::Value value = OfType(known->second, *member);
    if (!value.isNull()) fields[known->first] = std::move(value);
  }
  attachments = ListedAttachments(said[kAttachmentsMember]);
  return true;
}

}  // namespace ferrox::extract
