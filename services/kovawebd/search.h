#pragma once

#include <json/value.h>

#include "services/kovawebd/route.h"

namespace ferrox::web {

// What the routes of searching answer (docs/http.md): the engine's answers for the user who asks, in the API's words.
// All throw Problem.

/// One page, of as many of the engine's as it takes; with "fresh", once all that was changed before can be found.
Json::Value Search(const Call& call);
Json::Value Complete(const Call& call);
Json::Value ShowFile(const Call& call);
Json::Value ListShares(const Call& call);

}  // namespace ferrox::web
