#pragma once

#include <string>
#include <vector>

#include "services/kovawebd/message.h"

namespace ferrox::web {

/// Against pages of other sites whose name a resolver turns into this host's address: a request by TCP must name this
/// daemon by an address of it or by one of `names`, with any port, and so must the page that it comes from, where it
/// says so. @throws Problem 400 for not one Host, 421.
void CheckHost(const Request& request, const std::vector<std::string>& names);

}  // namespace ferrox::web
