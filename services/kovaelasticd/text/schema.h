#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>

#include <json/value.h>

#include "wire/fields.h"

namespace ferrox::engine {

/// The members of a document that the engine itself knows.
namespace field {
inline constexpr auto& kPath = fileindex::elastic::kKOVAMDPath;
inline constexpr auto& kParent = fileindex::elastic::kKOVAMDParent;
inline constexpr auto& kFsName = fileindex::elastic::kKOVAMDFSName;
inline constexpr auto& kSearchName = fileindex::elastic::kKOVAMDSearchFileName;
inline constexpr auto& kDisplayName = fileindex::elastic::kKOVAMDDisplayName;
inline constexpr auto& kKind = fileindex::elastic::kKOVAMDKind;
inline constexpr auto& kExtension = fileindex::elastic::kKOVAMDExtension;
inline constexpr auto& kIsDir = fileindex::elastic::kKOVAMDIsDir;
inline constexpr auto& kSize = fileindex::elastic::kKOVAMDFSSize;
inline constexpr auto& kContentChangeDate = fileindex::elastic::kKOVAMDFSContentChangeDate;
inline constexpr auto& kTextContent = fileindex::elastic::kKOVAMDTextContent;
inline constexpr auto& kTitle = fileindex::elastic::kKOVAMDTitle;
inline constexpr auto& kLanguages = fileindex::elastic::kKOVAMDLanguages;
inline constexpr auto& kAccess = fileindex::elastic::k_KOVAAccess;
inline constexpr auto& kExtractError = fileindex::elastic::k_KOVAExtractError;
}  // namespace field

/// What a file is, as "kind:" asks, by its extension. Stored in docs.kind: the numbers never change.
enum Kind : int32_t { kDocument = 0, kAudio = 1, kVideo = 2, kImage = 3, kOther = 4, kFolder = 5 };

/// How the fields of an index's documents are checked and searched, from the mappings that the index was created with.
/// Does not change, so any thread may use it.
///
/// Mappings are {"properties": {FIELD: {"type": ..., "_all": ...}}, "default": {...}}. A type of "text", "int",
/// "double" or "bool" is checked, "string" takes anything; "_all" false takes a field out of plain words. Which fields
/// "field:value" and ranges know does not depend on the mappings, so all indices answer one query alike.
class Schema {
 public:
  /// `mappings` as index_create carries them; null stands for none: nothing is checked then.
  /// @throws Error kEngineBadRequest when they are not as they must be.
  explicit Schema(const Json::Value& mappings);

  /// @throws Error kEngineBadRequest, naming the field, when a member has not the type of its field.
  void Check(const Json::Value& document) const;

  /// Whether the plain words of a query look into the field.
  bool IsPlain(const std::string& name) const;
  /// Whether "field:value" looks into the field.
  static bool IsSearchable(const std::string& name);
  /// Whether the field holds a number that ranges are asked for.
  static bool IsRanged(const std::string& name);

  /// As they were given.
  const Json::Value& Mappings() const { return mappings_; }

 private:
  enum class Type { kAny, kText, kInt, kDouble, kBool };
  struct Field {
    Type type = Type::kAny;
    bool plain = true;  ///< "_all"
  };
  static Field ReadField(const std::string& name, const Json::Value& attributes, const Field& defaults);

  Json::Value mappings_;
  Field default_;
  std::unordered_map<std::string, Field> fields_;
};

}  // namespace ferrox::engine
