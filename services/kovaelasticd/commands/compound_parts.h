#pragma once

#include <cstddef>
#include <deque>
#include <string_view>
#include <utility>
#include <vector>

#include <json/value.h>

namespace ferrox::engine {

inline constexpr char kShapeText[] =
    "a request is a JSON object {\"command\": ..., \"data\": {...}} or {\"compound\": [...]}";

/// A command's JSON text as a tree. @throws Error kEngineBadRequest when it is no JSON, or has more than 100,000
/// values.
Json::Value ParseCommand(std::string_view text);

/// The parts of a compound in order, each a tree only while it is worked on: all at once may be fifty times as large as
/// the request, which has any number of them.
class CompoundParts {
 public:
  /// Parses each part of the array `text`, which must outlive this, and has `check` see it.
  /// @throws Error as ParseCommand; also when it is no array, or has more than 4,000,000 parts; and what `check`
  /// throws.
  template <typename Check>
  CompoundParts(std::string_view text, const Check& check) : texts_(TextsOf(text)) {
    size_t bytes = 0;
    for (const std::string_view part : texts_) {
      Json::Value tree = ParseCommand(part);
      check(std::as_const(tree));
      // Most compounds are small, and need not be parsed twice.
      if (bytes < kTreesBytes && (bytes += TreeBytes(part)) < kTreesBytes) trees_.push_back(std::move(tree));
    }
  }

  /// Whether all parts were taken.
  bool AtEnd() const { return next_ == texts_.size(); }
  /// The next part, not at the end.
  Json::Value& Front();
  /// The same, which is no longer kept here.
  Json::Value Take();
  /// The next parts, at least one: as many as `belong` and may be trees together.
  template <typename Belongs>
  std::vector<Json::Value> TakeWhile(const Belongs& belongs) {
    std::vector<Json::Value> taken;
    size_t bytes = 0;
    do {
      bytes += TreeBytes(texts_[next_]);
      taken.push_back(Take());
    } while (!AtEnd() && bytes < kTreesBytes && belongs(Front()));
    return taken;
  }

 private:
  /// How much memory the trees of parts may take together, about.
  static constexpr size_t kTreesBytes = 32 << 20;
  /// What a part's tree takes, by its text.
  static size_t TreeBytes(std::string_view text);
  /// The elements of the array as they stand in its text.
  static std::vector<std::string_view> TextsOf(std::string_view array);

  std::vector<std::string_view> texts_;  ///< of all parts, within the request
  size_t next_ = 0;                      ///< the part that Front gives
  std::deque<Json::Value> trees_;        ///< of the next parts, as far as they have been parsed
};

}  // namespace ferrox::engine
