#pragma once

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include <json/value.h>

#include "services/kovawebd/message.h"

namespace ferrox::web {

/// For whom a request is answered.
struct Who {
  uid_t uid = 0;
  bool by_token = false;
};

/// A parameter of the query. Texts are UTF-8, but for names of files, which may be any bytes.
struct Parameter {
  enum class Kind { kText, kFileName, kNumber, kYesNo };

  const char* name;
  Kind kind = Kind::kText;
  const char* description = "";
  bool required = false;
  bool repeated = false;
  int64_t low = 1, high = 4096;          ///< of a number; else of the bytes of a text
  std::vector<std::string> values = {};  ///< the only ones; none: any
};

/// What a route is asked, checked against its parameters.
struct Call {
  Who who;
  std::map<std::string, std::vector<std::string>> parameters;  ///< by name; those that were not given are missing
  Json::Value body;                                            ///< of a route that takes one, an object
  std::string last;  ///< the last part of the path, where the route's ends in a variable

  bool Has(const std::string& name) const { return parameters.count(name) != 0; }
  std::string Text(const std::string& name, const std::string& otherwise = "") const;
  int64_t Number(const std::string& name, int64_t otherwise) const;
  bool Yes(const std::string& name) const { return Text(name) == "true"; }
};

/// One row of the table that requests are held against, and that the API's description is made of.
struct Route {
  enum class For {
    kAnyone,  ///< also without a token
    kUser,    ///< who is known, by the Unix socket or a token
    kLocal,   ///< by the Unix socket alone
  };

  const char* method;
  const char* path;  ///< "/api/v1/tokens/{id}": a variable can be the last part
  const char* name;  ///< of the operation, in the description
  const char* summary;
  For whom = For::kUser;
  std::vector<Parameter> parameters = {};
  std::vector<Parameter> body = {};  ///< members of a JSON object; none: no body is read
  std::function<Json::Value(const Call& call)> answer = {};
};

/// The route of a path and a method, with the variable part of the path; "HEAD" is as "GET".
/// @throws Problem 404, 405.
struct Found {
  const Route* route;
  std::string last;
};
Found FindRoute(const std::vector<Route>& routes, const std::string& method, const std::string& path);

/// @throws Problem 400 for a parameter or a member that is unknown, missing, twice or not as it must be.
Call ReadCall(const Route& route, const Found& found, const std::string& target, const std::string& body);

}  // namespace ferrox::web
