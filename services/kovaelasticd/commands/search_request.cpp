#include "services/kovaelasticd/commands/search_request.h"

#include <string>

#include "common/error.h"
#include "services/kovaelasticd/commands/members.h"

namespace ferrox::engine {

namespace {

constexpr size_t kMarkMaxBytes = 64;

[[noreturn]] void Refuse(const std::string& sentence) { throw Error(Error::kEngineBadRequest, sentence); }

SortKey ReadSort(const Json::Value& data) {
  const std::string name = OptionalText(data, "sort").value_or("relevance");
  if (name == "relevance") return SortKey::kRelevance;
  if (name == "date") return SortKey::kDate;
  if (name == "name") return SortKey::kName;
  if (name == "size") return SortKey::kSize;
  Refuse("\"sort\" must be relevance, date, name or size");
}

bool ReadAscending(const Json::Value& data, SortKey sort) {
  const std::string order = OptionalText(data, "order").value_or(sort == SortKey::kName ? "asc" : "desc");
  if (order != "asc" && order != "desc") Refuse("\"order\" must be asc or desc");
  return order == "asc";
}

std::string ReadMark(const Json::Value& data, const char* name, const char* otherwise) {
  const std::string mark = OptionalText(data, name).value_or(otherwise);
  if (mark.size() > kMarkMaxBytes) Refuse("\"" + std::string(name) + "\" must be a text of at most 64 bytes");
  return mark;
}

}  // namespace

SearchRequest ReadSearch(const Json::Value& data) {
  SearchRequest request;
  request.offset = OptionalInt(data, "offset", 0, 0, kLastHitMax);
  request.limit = OptionalInt(data, "limit", 20, 0, kHitsMax);
  if (request.offset + request.limit > kLastHitMax) {
    Refuse("only the first " + std::to_string(kLastHitMax) + " hits can be shown; narrow the query");
  }
  request.sort = ReadSort(data);
  request.ascending = ReadAscending(data, request.sort);
  request.snippet = OptionalBool(data, "snippet", true);
  request.all_words = OptionalBool(data, "all_words", false);
  request.explain = OptionalBool(data, "explain", false);
  request.mark_start = ReadMark(data, "mark_start", "[");
  request.mark_end = ReadMark(data, "mark_end", "]");
  return request;
}

}  // namespace ferrox::engine
