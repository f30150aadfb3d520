#pragma once

#include <chrono>
#include <string>

namespace ferrox::services {

enum class RequestResult { kAnswered, kNotRunning, kNotPermitted, kNoAnswer };

/// Sends one request to a daemon of this instance and waits for its reply, and then for more of it, at most `longest`
/// each time; without retries. `reply` is filled when it was answered.
RequestResult AskLocally(const std::string& socket_path, const std::string& request, std::chrono::milliseconds longest,
                         std::string& reply);

/// Whether a process serves the socket, also one that this user may not talk to.
bool IsServed(const std::string& socket_path);

}  // namespace ferrox::services
