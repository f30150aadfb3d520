#include "platform/shared/monitor_document.h"

#include <climits>

namespace kova {

namespace {

/// Without a trailing slash: a path has one form only.
bool IsAbsolutePath(const Json::Value& value) {
  if (!value.isString()) return false;
  const std::string path = value.asString();
  return path.size() > 1 && path.size() < PATH_MAX && path.front() == '/' && path.back() != '/' &&
         path.find('\0') == std::string::npos;
}

/// One component of a path.
bool IsPlainName(const Json::Value& value) {
  if (!value.isString()) return false;
  const std::string name = value.asString();
  return !name.empty() && name != "." && name != ".." && name.size() <= NAME_MAX &&
         name.find_first_of(std::string("/\0", 2)) == std::string::npos;
}

std::string WatchProblem(const Json::Value& watch) {
  if (!watch.isObject()) return "is not an object";
  if (!IsAbsolutePath(watch["path"])) return "has no absolute \"path\"";
  if (!watch["mask"].isUInt()) return "has no \"mask\"";
  const Json::Value& ignore = watch["ignore"];
  if (!ignore.isArray()) return "has no array \"ignore\"";
  for (const Json::Value& name : ignore) {
    if (!IsPlainName(name)) return "ignores something that is no plain name";
  }
  return {};
}

bool EndsInSlash(const Json::Value& watch) {
  if (!watch.isObject() || !watch["path"].isString()) return false;
  const std::string path = watch["path"].asString();
  return path.size() > 1 && path.front() == '/' && path.back() == '/';
}

}  // namespace

Json::Value WithoutTrailingSlashes(const Json::Value& document, std::vector<std::string>& left_out) {
  if (!document.isObject() || !document["config"].isArray()) return document;
  Json::Value kept = document;
  kept["config"] = Json::Value(Json::arrayValue);
  for (const Json::Value& watch : document["config"]) {
    if (EndsInSlash(watch)) {
      left_out.push_back(watch["path"].asString());
    } else {
      kept["config"].append(watch);
    }
  }
  return kept;
}

std::string MonitorDocumentProblem(const Json::Value& document) {
  if (!document.isObject()) return "the registration is not an object";
  if (!IsAbsolutePath(document["queue"])) return "the registration has no absolute path \"queue\"";
  const Json::Value& config = document["config"];
  if (!config.isArray()) return "the registration has no array \"config\"";
  for (Json::ArrayIndex i = 0; i < config.size(); ++i) {
    const std::string problem = WatchProblem(config[i]);
    if (!problem.empty()) return "number " + std::to_string(i + 1) + " of \"config\" " + problem;
  }
  return {};
}

}  // namespace kova
