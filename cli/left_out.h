#pragma once

#include <functional>
#include <string>

#include <json/value.h>

namespace ferrox::cli {

/// The shares that a command was to look at and could not, or not wholly, each with the reason and the remedy. Where
/// there is one, nobody must take what was found for all that there is.
class LeftOut {
 public:
  /// Replaces what was said of the share before. `code`: the engine's, 0 for none. `searched`: what its index holds was
  /// shown nevertheless.
  void Add(const std::string& share, int code, const std::string& reason, bool searched = false);
  /// The share, when its index is being rebuilt. @return whether that is so.
  bool AddIfRebuilding(const std::string& share);
  /// Takes the entries of an engine's reply.
  void AddFrom(const Json::Value& reply);

  /// Runs what concerns a share. Where an engine refuses, the share is left out. @return whether that was not so.
  bool Unless(const std::string& share, const std::function<void()>& run);

  /// How many were not searched at all.
  size_t Unsearched() const;
  bool Empty() const { return list_.empty(); }
  /// An array of {"share", "id", "code", "reason", "searched"}, for scripts.
  const Json::Value& ToJson() const { return list_; }
  /// Prints a line for each on standard error.
  void Warn() const;

 private:
  Json::Value list_{Json::arrayValue};
};

}  // namespace ferrox::cli
