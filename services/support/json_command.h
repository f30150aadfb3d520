#pragma once

#include <functional>
#include <initializer_list>
#include <string>

#include <json/value.h>

#include "services/support/frame_server.h"

namespace ferrox::services {

/// Carries one command out and returns the "data" of its reply. An Error becomes a reply that says so.
using JsonCommand = std::function<Json::Value(const std::string& type, const Json::Value& data)>;

/// Root, and the user that this process runs as: the owner of an instance that is not root's.
bool IsRootOrOwner(const Peer& peer);

/// Runs on the calling thread for as long as the command does.
/// Answers a request of the form that docs/formats/daemon.md describes; never throws. Only root and the owner are
/// obeyed, and in the commands `of_engine` the engine's own user (services/support/engine_user.h).
std::string AnswerJsonCommand(const std::string& request, const Peer& peer, const JsonCommand& command,
                              std::initializer_list<const char*> of_engine = {});

}  // namespace ferrox::services
