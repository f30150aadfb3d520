#pragma once

#include <string>

#include <json/value.h>

#include "services/kova-access/live_share.h"
#include "services/kova-access/request.h"
#include "services/support/frame_server.h"
#include "services/support/open_limit.h"

namespace ferrox::access {

/// Answers what a user may open (docs/formats/access.md). Any thread may call it; it blocks for as long as the file
/// system asked for does.
class AccessServer {
 public:
  explicit AccessServer(const services::OpenLimit::Options& limit) : limit_(limit) {}

  services::FrameReply Handle(const std::string& request, const services::Peer& peer);

 private:
  Json::Value Answer(const Request& request, base::UniqueFd& descriptor);

  const OwnDescriptors own_descriptors_;
  services::OpenLimit limit_;
};

}  // namespace ferrox::access
