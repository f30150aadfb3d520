#pragma once

#include <json/value.h>

#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/entered_shares.h"
#include "services/kovaelasticd/commands/share_paths.h"
#include "services/kovaelasticd/indices/registry.h"
#include "services/kovaelasticd/store/asker.h"
#include "services/kovaelasticd/store/index_store.h"

namespace ferrox::engine {

/// The command "search" for an ordinary user: what the asker may read of the shares that the asker can enter. Every
/// member of the reply follows from that alone. `query` is that of the request; its paths are resolved.
/// @throws Error; what an ordinary user is told of it is SentenceForUsers.
Json::Value SearchForUser(const CommandCall& call, const Asker& asker, const SearchRequest& request, AskedQuery& query);

/// Opens the index of a share for an asker. @throws Error when it is not to be searched for users: refused to them,
/// being prepared, paused, unreadable, or no longer that of the share.
Registry::OpenIndex OpenForUser(const CommandCall& call, const EnteredShare& share);

/// A document's fields as ordinary users are shown them: none of what the engine or the index daemon keeps for itself.
Json::Value FieldsForUsers(Json::Value fields);

}  // namespace ferrox::engine
