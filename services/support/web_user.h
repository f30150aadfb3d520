#pragma once

#include <optional>

#include "services/support/engine_user.h"

/// The web daemon (kovawebd): its places, and which user it is.
namespace ferrox::services {

/// Its own folder, with its tokens. Whose it is, is the daemon's user.
inline constexpr char kWebFolder[] = "/var/lib/kova/kovawebd";
/// What root has told it of the settings, which only root may read.
inline constexpr char kWebSettingsCopy[] = "/var/lib/kova/kovawebd.json";
inline constexpr char kWebRunFolder[] = "/var/run/kovawebd";
inline constexpr char kWebSocket[] = "/var/run/kovawebd/sock";

/// The web daemon's own user, who may ask the engine for others. Nothing where it has none (UserOfFolder).
inline std::optional<EngineIds> WebUser() { return UserOfFolder(kWebFolder); }

}  // namespace ferrox::services
