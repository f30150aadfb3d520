#include "services/kovaelasticd/indices/share_note.h"

#include "common/json_util.h"

namespace ferrox::engine {

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
  return std::make_shared<const ShareNote>(std::move(note));
}

}  // namespace ferrox::engine
