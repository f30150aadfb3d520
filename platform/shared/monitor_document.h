#pragma once

#include <string>
#include <vector>

#include <json/value.h>

namespace kova {

/// The form of a registration with the notification daemon, which the host's platform and the tests' fake check alike.
/// What keeps `document` from being a registration of kova/notifyd.h; empty when nothing does.
std::string MonitorDocumentProblem(const Json::Value& document);

/// The registration without the folders whose path ends in "/", as a list that people write may have them: they alone
/// are not watched. Their paths are appended to `left_out`. What is no registration comes back as it is.
Json::Value WithoutTrailingSlashes(const Json::Value& document, std::vector<std::string>& left_out);

}  // namespace kova
