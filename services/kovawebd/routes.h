#pragma once

#include <vector>

#include "services/kovawebd/route.h"

namespace ferrox::web {

/// The routes of searching, of the table that the service makes.
std::vector<Route> SearchRoutes();

}  // namespace ferrox::web
