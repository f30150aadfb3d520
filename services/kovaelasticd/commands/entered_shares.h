#pragma once

#include <optional>
#include <string>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/indices/registry.h"
#include "services/kovaelasticd/store/asker.h"

namespace ferrox::engine {

/// A share that an asker can enter. Others do not exist for the asker.
struct EnteredShare {
  std::string index_id;
  ShareNotePtr note;
  bool paused;
  Asker asker;  ///< AskerIn this share
};

/// The member "shares", each name once; nothing when it is absent. @throws Error kEngineBadRequest.
std::optional<std::vector<std::string>> ReadShareNames(const Json::Value& data);

/// Whether the asker of a request can enter a share: the look at its folder says so, and so do the share's rules where
/// a program asks for a user by name. Everything that shows an asker anything of a share goes by this. `note` null:
/// none.
bool IsLetIn(const CommandCall& call, const ShareNote* note, const wire::LiveFile& root);

/// The asker as one of this share's: with its root and, where a program asks for a user by name, with what its rules
/// say of names.
Asker AskerIn(const CommandCall& call, Asker asker, const ShareNote& note);

/// The shares that the asker can enter now, those that are refused to ordinary users among them: of the `named` ones in
/// their order, else of all in the order of their indices' ids.
/// @throws Error kEngineNoSuchIndex when one that is named cannot be entered, or is none; kEngineRightsUnknown.
std::vector<EnteredShare> EnteredShares(const CommandCall& call, const Asker& asker,
                                        const std::optional<std::vector<std::string>>& named);

/// kEngineNoSuchIndex; the same whether there is no such share, or the asker cannot enter it.
[[noreturn]] void RefuseShare(const std::string& name);

}  // namespace ferrox::engine
