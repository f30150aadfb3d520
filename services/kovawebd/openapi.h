#pragma once

#include <string>
#include <vector>

#include <json/value.h>

#include "services/kovawebd/route.h"

namespace ferrox::web {

/// The description of the API in OpenAPI 3.1: what the table of routes says, and nothing else.
Json::Value DescribeApi(const std::vector<Route>& routes, const std::string& version);

}  // namespace ferrox::web
