#pragma once

#include <string>

#include <json/value.h>

namespace kova {

/// What keeps `document` from being a registration of kova/notifyd.h; empty when nothing does.
std::string MonitorDocumentProblem(const Json::Value& document);

}  // namespace kova
