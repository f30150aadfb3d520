#include "services/kovaelasticd/text/codes.h"

namespace ferrox::engine {

std::vector<std::string> JoinedCodes(std::string_view /*text*/) { return {}; }

}  // namespace ferrox::engine
