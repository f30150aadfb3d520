#pragma once

#include <json/forwards.h>

#include "common/export.h"

/// The request channel to the search engine: one connection, one request and one reply a call (docs/formats/engine.md).
namespace ferrox::fileindex::elastic {

/// One attempt. Waits up to 15 s for the engine's socket, then until the engine answers; fills `res` with the reply.
/// Failed parts of a compound request are logged, unless the engine was busy.
/// @throws Error kEngineUnreachable "Connect failed", "Send failed" or "Recv failed, res=..."; the engine's own code
/// with "Request failed, msg=..."; kEngineBusy or kEngineBusyMemory for a busy part of a compound; kBadArgument when
/// the reply's error is not as it must be.
FERROX_EXPORT void SendRequestImpl(Json::Value& res, const Json::Value& req);

/// The same, asking again every 15 to 19 minutes for as long as the engine is busy; the administrators are notified
/// once after the 11th time. Blocks without an upper bound.
FERROX_EXPORT void SendRequest(Json::Value& res, const Json::Value& req);
/// The same, without the reply.
FERROX_EXPORT void SendRequest(const Json::Value& req);

}  // namespace ferrox::fileindex::elastic
