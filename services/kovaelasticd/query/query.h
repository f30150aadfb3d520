#pragma once

#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace ferrox::engine {

/// One condition of a query, or several joined (docs/formats/engine.md describes the language).
struct QueryNode {
  enum class Type {
    kAll,    ///< every document
    kAnd,    ///< all of `children`; none: every document
    kOr,     ///< one of `children`
    kNot,    ///< not `children[0]`
    kText,   ///< a word, phrase or beginning of a word in content, name or fields
    kField,  ///< the same in one of `fields`
    kName,   ///< the same in the name
    kExt,    ///< the extension is `text`
    kKind,   ///< the kind is one of `kinds`
    kPath,   ///< lies in the folder `text`, or is it
    kSize,   ///< the size lies in `low` .. `high`
    kDate,   ///< the date of change lies in `low` .. `high`
    kRange,  ///< a number in one of `fields` lies in `low` .. `high`
  };

  QueryNode() = default;
  explicit QueryNode(Type is) : type(is) {}

  Type type = Type::kAll;
  std::vector<QueryNode> children;
  std::string text;  ///< as written, without quotes
  bool phrase = false;
  bool prefix = false;
  bool pattern = false;   ///< of kText and kName: `text` has "*" and "?" as wildcards (Pattern)
  bool required = false;  ///< of kText: every hit must have it; else documents without it are found too, further behind
  /// Of a word that is the first of several neighbouring ones with digits, as "DE89" in "DE89 3704 0044": all of them,
  /// as they stand in the query. They may be one number or code, which documents have grouped otherwise. The others
  /// follow as the next children of the same node; with this one they are `joined_words`.
  std::string joined;
  size_t joined_words = 0;
  std::vector<std::string> fields;
  std::vector<int32_t> kinds;
  int64_t low = std::numeric_limits<int64_t>::min();
  int64_t high = std::numeric_limits<int64_t>::max();
};

/// So many bytes of a query are read.
constexpr size_t kQueryMaxBytes = 4096;
/// The most conditions in one, apart from plain words, and the deepest parentheses. A group in parentheses is one, too.
constexpr size_t kQueryMaxTerms = 64;
constexpr size_t kQueryMaxDepth = 16;

/// The most hints about one.
constexpr size_t kQueryHintsMax = 3;

/// Reads a query. Dates are taken in local time; `now` (seconds since the epoch) is what relative ones count from.
/// `hints`, unless null, gets sentences about what was read otherwise than it may be meant.
/// @throws Error kEngineBadRequest with a sentence that names the place, counted in characters from 1, and the remedy.
QueryNode ParseQuery(std::string_view text, int64_t now, std::vector<std::string>* hints = nullptr);

/// The query in one canonical line, for tests: "(and word +required (not name:x))"; of `joined` the words in
/// square brackets.
std::string PrintQuery(const QueryNode& query);

}  // namespace ferrox::engine
