#pragma once

#include <string>
#include <vector>

#include "services/kovawebd/message.h"
#include "services/kovawebd/route.h"
#include "services/kovawebd/tokens.h"
#include "wire/cancellation.h"

namespace ferrox::web {

/// What the daemon answers, whichever way a request came.
class Service {
 public:
  struct Options {
    std::vector<std::string> hosts = {};      ///< names by which the daemon may be asked, beside its addresses
    std::vector<std::string> addresses = {};  ///< where it listens by TCP
  };
  /// @param tokens must outlive the service
  Service(Options options, Tokens& tokens);
  Service(const Service&) = delete;
  Service& operator=(const Service&) = delete;

  /// Called on several threads at once. @throws Problem.
  Response Handle(const Request& request) const;
  /// Ends what waits for the engine; for the end of the daemon.
  void Cancel() { cancellation_.Cancel(); }

  const std::vector<Route>& Routes() const { return routes_; }

 private:
  std::vector<Route> MakeRoutes() const;
  Who Identify(const Request& request, const Route& route) const;
  Json::Value Status(const Call& call) const;

  const Options options_;
  Tokens& tokens_;
  const std::vector<Route> routes_;
  wire::Cancellation cancellation_;
};

}  // namespace ferrox::web
