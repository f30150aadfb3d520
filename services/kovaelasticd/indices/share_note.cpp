#include "services/kovaelasticd/indices/share_note.h"

#include <utility>
#include <vector>

#include "base/name_rules.h"
#include "common/json_util.h"

namespace ferrox::engine {

namespace {

constexpr size_t kPatternsMax = 1000;
constexpr size_t kPatternBytesMax = size_t{64} << 10;

/// Adds the patterns of a list. @return whether it is one, and not too long with those that are there already.
bool TakePatterns(const Json::Value& list, std::vector<std::string>& patterns) {
  if (!list.isArray() || patterns.size() + list.size() > kPatternsMax) return false;
  size_t bytes = 0;
  for (const std::string& pattern : patterns) bytes += pattern.size() + 1;
  for (const Json::Value& pattern : list) {
    if (!pattern.isString()) return false;
    patterns.push_back(pattern.asString());
    const std::string& text = patterns.back();
    bytes += text.size() + 1;
    const bool usable = !text.empty() && text.find('/') == std::string::npos && text.find('\0') == std::string::npos;
    if (!usable || bytes > kPatternBytesMax) return false;
  }
  return true;
}

}  // namespace

void ShareNote::ReadNames() {
  names.reset();
  const Json::Value& told = rules;  // a look at a member that is not there must not make it
  if (!told.isObject()) return;
  const Json::Value& case_counts = told["case_counts"];
  std::vector<std::string> patterns;
  if (!(case_counts.isNull() || case_counts.isBool()) || !TakePatterns(told["veto_files"], patterns)) return;
  const bool counts = case_counts.isBool() && case_counts.asBool();
  SharedNames read;
  read.vetoed = base::NameRules::TextOf(patterns, counts);
  if (!TakePatterns(told["hide_files"], patterns)) return;
  read.unseen = base::NameRules::TextOf(patterns, counts);
  names = std::move(read);
}

Json::Value ShareNote::ToJson() const {
  Json::Value stored;
  stored["share"] = share;
  stored["root"] = root;
  if (!refused.empty()) stored["refused"] = refused;
  if (!rules.isNull()) stored["rules"] = rules;
  return stored;
}

ShareNotePtr ShareNote::FromJson(const Json::Value& stored) {
  if (stored.isNull()) return nullptr;
  ShareNote note;
  GetJsonValue(note.share, stored, "share", true);
  GetJsonValue(note.root, stored, "root", true);
  GetJsonValue(note.refused, stored, "refused", false);
  GetJsonValue(note.rules, stored, "rules", false);
  note.ReadNames();
  return std::make_shared<const ShareNote>(std::move(note));
}

}  // namespace ferrox::engine
