#include "services/kovaelasticd/text/title.h"

namespace ferrox::engine {

std::string TitleOf(std::string_view /*text*/, std::string_view /*ext*/) { return {}; }

}  // namespace ferrox::engine
