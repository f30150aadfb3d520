#pragma once

#include <functional>
#include <string>
#include <utility>

#include <json/value.h>

#include "services/kova-access/live_share.h"
#include "services/kova-access/request.h"
#include "services/support/frame_server.h"
#include "services/support/open_limit.h"
#include "wire/synonyms.h"
#include "wire/trust.h"

namespace ferrox::access {

/// Answers what a user may open, whom the settings trust, and which words mean the same (docs/formats/access.md). Any
/// thread may call it; it blocks for as long as the file system asked for does.
class AccessServer {
 public:
  using ReadTrust = std::function<wire::Trust()>;
  using ReadSynonyms = std::function<wire::SynonymAnswer(const std::string& known)>;

  /// Those two read the settings of now, as wire/trust.h and wire/synonyms.h say; any thread calls them.
  explicit AccessServer(
      const services::OpenLimit::Options& limit, ReadTrust trust = [] { return wire::Trust(); },
      ReadSynonyms synonyms = [](const auto&) { return wire::SynonymAnswer(); })
      : limit_(limit), trust_(std::move(trust)), synonyms_(std::move(synonyms)) {}

  services::FrameReply Handle(const std::string& request, const services::Peer& peer);

 private:
  Json::Value Answer(const Request& request, base::UniqueFd& descriptor);

  const OwnDescriptors own_descriptors_;
  services::OpenLimit limit_;
  const ReadTrust trust_;
  const ReadSynonyms synonyms_;
};

}  // namespace ferrox::access
