#include "wire/synonyms.h"

#include <json/value.h>

#include "common/paths.h"
#include "wire/frame_client.h"

namespace ferrox::wire {

namespace {

bool ReadTexts(const Json::Value& list, std::vector<std::string>& texts) {
  if (!list.isArray()) return false;
  for (const Json::Value& text : list) {
    if (!text.isString()) return false;
    texts.push_back(text.asString());
  }
  return true;
}

bool ReadRules(const Json::Value& list, std::vector<SynonymRule>& rules) {
  if (!list.isArray()) return false;
  for (const Json::Value& entry : list) {
    if (!entry.isArray() || entry.size() != 2) return false;
    SynonymRule& rule = rules.emplace_back();
    if (!ReadTexts(entry[0], rule.first) || !ReadTexts(entry[1], rule.second)) return false;
  }
  return true;
}

}  // namespace

/// A member that is not as it must be makes it no answer.
std::optional<SynonymAnswer> AskSynonyms(const std::string& known, std::chrono::milliseconds longest) {
  Json::Value data;
  data["known"] = known;
  const Reply reply = AskDaemon(kAccessSocket, "synonyms", data, longest);
  if (reply.outcome != Outcome::kAnswered || !reply.data.isObject() || !reply.data["stamp"].isString()) return {};
  SynonymAnswer answer;
  answer.stamp = reply.data["stamp"].asString();
  if (!reply.data.isMember("rules")) return answer;
  return ReadRules(reply.data["rules"], answer.rules.emplace()) ? std::optional(std::move(answer)) : std::nullopt;
}

}  // namespace ferrox::wire
