#pragma once

#include <vector>

#include "services/kovawebd/message.h"
#include "services/kovawebd/route.h"
#include "services/kovawebd/tokens.h"

namespace ferrox::web {

/// The routes by which users of this host make, list and revoke their tokens, on the Unix socket alone. `tokens` must
/// outlive them.
std::vector<Route> TokenRoutes(Tokens& tokens);

/// Whose token a request by TCP brings along ("Authorization: Bearer ..."). @throws Problem 401.
Who WhoBringsToken(const Request& request, const Tokens& tokens);

}  // namespace ferrox::web
