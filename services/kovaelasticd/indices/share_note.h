#pragma once

#include <memory>
#include <string>

#include <json/value.h>

namespace ferrox::engine {

/// Which share an index is of, as the index daemon says it. An index without such a note does not exist for ordinary
/// users: nobody knows whether they may reach what it tells of.
struct ShareNote {
  std::string share;    ///< its name
  std::string root;     ///< its folder, without "/" at its end
  std::string refused;  ///< why ordinary users may not search it, a sentence; "": they may
  Json::Value rules;    ///< who may use it by the network's rules, for those who come "as user N"; null: none are known

  bool operator==(const ShareNote& other) const = default;
  Json::Value ToJson() const;
  /// @return null for JSON's null. @throws Error kBadArgument.
  static std::shared_ptr<const ShareNote> FromJson(const Json::Value& stored);
};

/// Never changed once it is there, so that copies of an index's record are cheap. Null: no share is known.
using ShareNotePtr = std::shared_ptr<const ShareNote>;

}  // namespace ferrox::engine
