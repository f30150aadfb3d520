#include "services/kovaelasticd/store/fts_positions.h"

#include <string_view>

namespace ferrox::engine {

namespace {

/// What tells CollectPositions' own calls from others, as kCollectorType does for Collect.
constexpr char kPositionsType[] = "PositionRequest";

/// A row that xQueryPhrase visits: it has the one phrase.
int TakePositions(const Fts5ExtensionApi* api, Fts5Context* row, void* user) {
  auto* request = static_cast<PositionRequest*>(user);
  const int64_t id = api->xRowid(row);
  if (!request->wanted.Contains(id)) return SQLITE_OK;
  Fts5PhraseIter iterator;
  int column = -1;
  int offset = -1;
  const int result = api->xPhraseFirst(row, 0, &iterator, &column, &offset);
  if (result != SQLITE_OK) return result;
  for (size_t taken = 0; column >= 0 && taken < request->most; ++taken) {
    request->found.push_back({static_cast<uint32_t>(id), static_cast<uint32_t>(offset), request->term});
    api->xPhraseNext(row, &iterator, &column, &offset);
  }
  return SQLITE_OK;
}

/// kova_positions(table, request): walks all rows of each phrase of the expression.
void PositionsFunction(const Fts5ExtensionApi* api, Fts5Context* row, sqlite3_context* context, int count,
                       sqlite3_value** arguments) {
  auto* request =
      count == 1 ? static_cast<PositionRequest*>(sqlite3_value_pointer(arguments[0], kPositionsType)) : nullptr;
  if (request == nullptr) {
    sqlite3_result_error(context, "kova_positions is for the engine alone", -1);
    return;
  }
  int result = SQLITE_OK;
  for (int phrase = 0; phrase < api->xPhraseCount(row) && result == SQLITE_OK; ++phrase) {
    result = api->xQueryPhrase(row, phrase, request, &TakePositions);
  }
  if (result != SQLITE_OK) sqlite3_result_error_code(context, result);
}

}  // namespace

void RegisterPositions(Database& database, fts5_api* api) {
  database.Check(api->xCreateFunction(api, "kova_positions", nullptr, &PositionsFunction, nullptr));
}

void CollectPositions(Database& database, const char* table, const std::string& expression, PositionRequest request) {
  const std::string name(table);
  Statement statement =
      database.Prepare("SELECT kova_positions(" + name + ", ?1) FROM " + name + " WHERE " + name + " MATCH ?2 LIMIT 1");
  statement.BindPointer(1, &request, kPositionsType).Bind(2, std::string_view(expression));
  while (statement.Step()) {
  }
}

}  // namespace ferrox::engine
