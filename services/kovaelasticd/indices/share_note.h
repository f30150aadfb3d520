#pragma once

#include <memory>
#include <optional>
#include <string>

#include <json/value.h>

namespace ferrox::engine {

/// The names that a share does not show to those who come "as user N"; texts of NameRules.
struct SharedNames {
  std::string unseen;  ///< searches do not find them
  std::string vetoed;  ///< of these, those that cannot be opened by their path either

  bool operator==(const SharedNames& other) const = default;
};

/// Which share an index is of, as the index daemon says it. An index without such a note does not exist for ordinary
/// users: nobody knows whether they may reach what it tells of.
struct ShareNote {
  std::string share;    ///< its name
  std::string root;     ///< its folder, without "/" at its end
  std::string refused;  ///< why ordinary users may not search it, a sentence; "": they may
  Json::Value rules;    ///< who may use it by the network's rules, for those who come "as user N"; null: none are known
  /// Of `rules`, by ReadNames; nothing where these lack it, or have another shape: then nobody comes by name.
  std::optional<SharedNames> names = {};

  /// To be called when `rules` have changed.
  void ReadNames();

  bool operator==(const ShareNote& other) const = default;
  Json::Value ToJson() const;
  /// @return null for JSON's null. @throws Error kBadArgument.
  static std::shared_ptr<const ShareNote> FromJson(const Json::Value& stored);
};

/// Never changed once it is there, so that copies of an index's record are cheap. Null: no share is known.
using ShareNotePtr = std::shared_ptr<const ShareNote>;

}  // namespace ferrox::engine
