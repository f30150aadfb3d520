#pragma once

#include <functional>
#include <string>

#include <json/value.h>

namespace ferrox::cli {

/// The shares that a command was to search or list and could not, or not wholly, each with the reason and the remedy.
/// Where there is one, what was found must not be taken for all that there is: the command says so on standard error
/// and ends with kIncomplete.
class LeftOut {
 public:
  /// Replaces what was said of the share before. `code`: the engine's, 0 for none. `searched`: what its index holds was
  /// shown nevertheless.
  void Add(const std::string& share, int code, const std::string& reason, bool searched = false);
  /// The share, when its index is being rebuilt. @return whether that is so.
  bool AddIfRebuilding(const std::string& share);
  /// Takes the entries of an engine's reply.
  void AddFrom(const Json::Value& reply);
  /// As Add, for ordinary users, to whom the engine names shares and no indices.
  void AddForUser(const std::string& share, int code, const std::string& reason, bool searched = false);

  /// Runs what concerns a share. Where the engine refuses, the share is left out and the command goes on with the next.
  /// @return whether `run` succeeded. @throws what `run` throws besides a refusal of the engine.
  bool Unless(const std::string& share, const std::function<void()>& run);

  /// How many were not searched at all.
  size_t Unsearched() const;
  bool Empty() const { return list_.empty(); }
  /// An array of {"share", "id", "code", "reason", "searched"}, for scripts; for ordinary users without "id".
  const Json::Value& ToJson() const { return list_; }
  /// Prints a line for each on standard error.
  void Warn() const;

 private:
  void Put(Json::Value entry);

  Json::Value list_{Json::arrayValue};
};

}  // namespace ferrox::cli
