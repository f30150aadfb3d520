#pragma once

#include <functional>
#include <string>
#include <utility>

#include <json/value.h>

#include "services/kova-access/live_share.h"
#include "services/kova-access/request.h"
#include "services/support/frame_server.h"
#include "services/support/open_limit.h"
#include "wire/trust.h"

namespace ferrox::access {

/// Answers what a user may open, and whom the settings trust (docs/formats/access.md). Any thread may call it; it
/// blocks for as long as the file system asked for does.
class AccessServer {
 public:
  /// `trust` reads the settings of now; any thread calls it.
  explicit AccessServer(
      const services::OpenLimit::Options& limit, std::function<wire::Trust()> trust = [] { return wire::Trust(); })
      : limit_(limit), trust_(std::move(trust)) {}

  services::FrameReply Handle(const std::string& request, const services::Peer& peer);

 private:
  Json::Value Answer(const Request& request, base::UniqueFd& descriptor);

  const OwnDescriptors own_descriptors_;
  services::OpenLimit limit_;
  const std::function<wire::Trust()> trust_;
};

}  // namespace ferrox::access
