#pragma once

#include <chrono>
#include <cstdint>
#include <functional>

#include "services/support/frame_server.h"

namespace ferrox::engine {

/// How long the engine works for one request of an ordinary user.
inline constexpr std::chrono::seconds kUserWorkLongest{2};

/// What one ordinary user may use of the engine's server: 64 KiB a request, 16 connections, 2 requests at work and 8
/// that wait. Whoever is privileged (CallerOf) is not bound.
/// `is_trusted`: whose programs may ask for many users. They are bound by what all ordinary users have together; the
/// engine binds each user for whom they ask.
services::UserLimits LimitsOfUsers(uint32_t instance_owner, std::function<bool(uint32_t uid)> is_trusted);

}  // namespace ferrox::engine
