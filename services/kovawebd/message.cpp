#include "services/kovawebd/message.h"

#include <json/value.h>

#include "common/json_util.h"

namespace ferrox::web {

const char* PhraseOf(int status) {
  switch (status) {
    case 400:
      return "Bad Request";
    case 401:
      return "Unauthorized";
    case 403:
      return "Forbidden";
    case 404:
      return "Not Found";
    case 405:
      return "Method Not Allowed";
    case 413:
      return "Content Too Large";
    case 421:
      return "Misdirected Request";
    case 429:
      return "Too Many Requests";
    case 431:
      return "Request Header Fields Too Large";
    case 500:
      return "Internal Server Error";
    case 503:
      return "Service Unavailable";
    case 504:
      return "Gateway Timeout";
    default:
      return "";
  }
}

Response ToResponse(const Problem& problem) {
  Json::Value json;
  json["type"] = "about:blank";
  json["title"] = PhraseOf(problem.status);
  json["status"] = problem.status;
  json["detail"] = problem.detail;
  Response response{problem.status, "application/problem+json", toString(json) + "\n", {}};
  if (problem.status == 401) response.headers.push_back({"WWW-Authenticate", "Bearer"});
  if (problem.status == 429 || problem.status == 503) response.headers.push_back({"Retry-After", "1"});
  return response;
}

}  // namespace ferrox::web
