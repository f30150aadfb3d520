#include "services/kovaelasticd/commands/search_answer.h"

#include "common/json_util.h"
#include "services/kovaelasticd/query/asked_fields.h"

namespace ferrox::engine {

namespace {

Json::Value RepairedJson(const RepairedWord& word) {
  Json::Value repaired;
  repaired["from"] = word.from;
  repaired["to"] = word.to;
  if (word.also) repaired["also"] = true;
  return repaired;
}

Json::Value PartJson(const ScorePart& part) {
  Json::Value explained;
  explained["what"] = part.what;
  if (!part.where.empty()) explained["where"] = part.where;
  explained["adds"] = part.adds;
  return explained;
}

}  // namespace

void AddTotalsAndWords(Json::Value& result, const MergedReply& found, const std::vector<std::string>& query_hints) {
  result["total"] = Json::Int64(found.total);
  if (found.total_all.has_value()) result["total_all"] = Json::Int64(*found.total_all);
  if (!found.ignored.empty()) result["ignored"] = Vec2JsonArr(found.ignored);
  for (const RepairedWord& word : found.repaired) result["repaired"].append(RepairedJson(word));
  for (const RepairedWord& word : found.synonyms) result["synonyms"].append(RepairedJson(word));
  if (found.none_has_all) result["none_has_all"] = true;
  if (found.total == 0 && !found.suggestions.empty()) result["suggestions"] = Vec2JsonArr(found.suggestions);
  for (const std::vector<std::string>* hints : {&query_hints, &found.hints}) {
    for (const std::string& hint : *hints) {
      if (result["hints"].size() < kQueryHintsMax) result["hints"].append(hint);
    }
  }
  if (result["hints"].empty()) result.removeMember("hints");
}

void AddFieldsAskedFor(Json::Value& result, const QueryNode& query) {
  for (const AskedFields& asked : FieldsAskedFor(query)) {
    Json::Value& entry = result["asked"].append(Json::Value());
    entry["name"] = asked.name;
    entry["fields"] = Vec2JsonArr(asked.fields);
  }
}

Json::Value HitForAll(const SearchHit& found) {
  Json::Value hit;
  hit["doc_id"] = found.path;
  hit["score"] = found.score;
  if (!found.snippet.empty()) hit["snippet"] = found.snippet;
  if (!found.title.empty()) hit["title"] = found.title;
  for (const ScorePart& part : found.explanation) hit["explain"].append(PartJson(part));
  return hit;
}

}  // namespace ferrox::engine
