#include "services/kovaelasticd/commands/compound_parts.h"

#include <optional>
#include <string>

#include "common/error.h"
#include "common/json_scan.h"
#include "common/json_util.h"

namespace ferrox::engine {

namespace {

/// No command needs so many values.
constexpr size_t kCommandValuesMax = 100000;
/// A request has no room for more commands that change a document.
constexpr size_t kPartsMax = 4000000;
/// What a value takes in a tree, about, beside its text.
constexpr size_t kValueBytes = 100;

}  // namespace

Json::Value ParseCommand(std::string_view text) {
  // A text shorter than that cannot hold as many values.
  if (text.size() > kCommandValuesMax && CountJsonValues(text) > kCommandValuesMax) {
    throw Error(Error::kEngineBadRequest, "a command may hold at most " + std::to_string(kCommandValuesMax) +
                                              " values; send several, or a compound of them");
  }
  Json::Value command;
  if (!fromString(command, std::string(text)) || !command.isObject()) throw Error(Error::kEngineBadRequest, kShapeText);
  return command;
}

std::vector<std::string_view> CompoundParts::TextsOf(std::string_view array) {
  std::optional<std::vector<std::string_view>> texts = JsonElements(array, kPartsMax);
  if (texts.has_value()) return *std::move(texts);
  throw Error(Error::kEngineBadRequest,
              "\"compound\" must be an array of at most " + std::to_string(kPartsMax) + " commands");
}

Json::Value& CompoundParts::Front() {
  if (trees_.empty()) trees_.push_back(ParseCommand(texts_[next_]));
  return trees_.front();
}

Json::Value CompoundParts::Take() {
  Json::Value part = std::move(Front());
  trees_.pop_front();
  ++next_;
  return part;
}

size_t CompoundParts::TreeBytes(std::string_view text) { return text.size() + kValueBytes * CountJsonValues(text); }

}  // namespace ferrox::engine
