#pragma once

#include <array>
#include <string>

#include <json/value.h>

#include "fileindex/folders/folder_rule.h"

namespace ferrox::cli {

/// The kinds of files whose content can be indexed, in the order of the configuration. Users write and read these
/// names.
inline constexpr auto& kKinds = fileindex::kContentKindNames;

/// The name of a file's kind by its extension; "" for one of none of these kinds.
std::string KindNameOf(const std::string& path);

/// A choice of kinds: of which files of a folder the content is indexed. Files of all kinds are found by name.
class Kinds {
 public:
  /// From "document,photo", "all" or "none". @throws UsageError.
  explicit Kinds(const std::string& text);
  /// From the stored form of a folder.
  explicit Kinds(const Json::Value& folder);

  /// Sets the members of the stored form of a folder.
  void Store(Json::Value& folder) const;
  /// Whether the content of a file is indexed: its kind is chosen, or it is of none of these kinds.
  bool WantsContent(const std::string& path) const;
  /// For people: "document, photo", "all kinds", "names only".
  std::string Text() const;

 private:
  std::array<bool, kKinds.size()> chosen_ = {};  ///< in the order of kKinds
};

}  // namespace ferrox::cli
