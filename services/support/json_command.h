#pragma once

#include <functional>
#include <string>

#include <json/value.h>

#include "services/support/frame_server.h"

namespace ferrox::services {

/// Carries one command out and returns the "data" of its reply. An Error becomes a reply that says so.
using JsonCommand = std::function<Json::Value(const std::string& type, const Json::Value& data)>;

/// Runs on the calling thread for as long as the command does.
/// Answers a request of the form that docs/formats/daemon.md describes; never throws. Only root and the owner of the
/// instance are obeyed.
std::string AnswerJsonCommand(const std::string& request, const Peer& peer, const JsonCommand& command);

}  // namespace ferrox::services
