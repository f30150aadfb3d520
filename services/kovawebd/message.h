#pragma once

#include <sys/types.h>

#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace ferrox::web {

/// One request, as it came: nothing of it is decoded or checked.
struct Request {
  std::string method;
  std::string target;  ///< of the request line: path and query
  std::vector<std::string> hosts = {};
  std::vector<std::string> origins = {};
  std::vector<std::string> authorizations = {};
  std::string body = {};
  std::optional<uid_t> local_user = {};  ///< of a Unix socket: the peer, as the kernel says
  std::string local_address = {};        ///< of TCP: the address of this end, without port and brackets
};

struct Response {
  int status = 200;
  std::string type = "application/json";
  std::string body = {};
  std::vector<std::pair<std::string, std::string>> headers = {};
};

/// A failure, as RFC 9457 has it: answered with `status`, and `detail` for people.
struct Problem {
  int status;
  std::string detail;
};
Response ToResponse(const Problem& problem);

/// The phrase of a status ("Not Found"), "" for those that are not used here.
const char* PhraseOf(int status);

}  // namespace ferrox::web
