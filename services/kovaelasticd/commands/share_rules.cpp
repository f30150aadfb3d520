#include "services/kovaelasticd/commands/share_rules.h"

#include <algorithm>
#include <set>

namespace ferrox::engine {

namespace {

constexpr size_t kRuleNamesMax = 10000;
constexpr size_t kRuleBytesMax = 1U << 20;

bool IsListOfNames(const Json::Value& list) {
  return list.isArray() && std::all_of(list.begin(), list.end(), [](const Json::Value& name) {
           return name.isString() && name.asString().find('\0') == std::string::npos;
         });
}

bool HaveShape(const Json::Value& rules) {
  return rules.isObject() && IsListOfNames(rules["valid_users"]) && IsListOfNames(rules["invalid_users"]);
}

}  // namespace

std::vector<std::string> NamesInRules(const std::vector<Registry::Listed>& listed) {
  std::set<std::string> names;
  size_t bytes = 0;
  for (const Registry::Listed& index : listed) {
    if (index.share == nullptr || !HaveShape(index.share->rules)) continue;
    for (const char* list : {"valid_users", "invalid_users"}) {
      for (const Json::Value& name : index.share->rules[list]) {
        const std::string text = name.asString();
        if (names.size() >= kRuleNamesMax || bytes + text.size() > kRuleBytesMax) continue;
        if (names.insert(text).second) bytes += text.size();
      }
    }
  }
  return {names.begin(), names.end()};
}

bool RulesLetIn(const Json::Value& rules, const NamedUser& user) {
  if (!HaveShape(rules) || rules.isMember("closed")) return false;
  const auto is_meant = [&user](const Json::Value& name) { return user.IsMeantBy(name.asString()); };
  for (const Json::Value& name : rules["invalid_users"]) {
    if (is_meant(name) != Meant::kNo) return false;
  }
  const Json::Value& valid = rules["valid_users"];
  return valid.empty() || std::any_of(valid.begin(), valid.end(),
                                      [&](const Json::Value& name) { return is_meant(name) == Meant::kYes; });
}

}  // namespace ferrox::engine
