#pragma once

#include <chrono>

#include <json/value.h>

#include "services/kovawebd/route.h"

namespace ferrox::web {

/// Asks the search engine for that user, who is told what a process of that user is (docs/formats/engine.md, "For users
/// by name"); in an instance that is not root's, for its owner, who alone is answered.
/// @throws Problem: 400 for what cannot be read, 403 for a user who may not ask, 404, 429, 503.
Json::Value AskEngineFor(const Who& who, const char* command, Json::Value data,
                         std::chrono::milliseconds longest = std::chrono::seconds(20));

/// Whether the engine answers.
bool IsEngineRunning();

}  // namespace ferrox::web
