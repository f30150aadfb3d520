#include "services/kova-access/access_server.h"

#include <unistd.h>

#include <string>
#include <utility>
#include <vector>

#include "services/support/json_command.h"

namespace ferrox::access {

namespace {

/// Of a file that the user may not open, nothing is told.
Json::Value JsonOf(const wire::LiveFile& file) {
  Json::Value json(Json::objectValue);
  if (file.readable) json["readable"] = true;
  if (file.entered) json["entered"] = true;
  if (file.stamp.empty()) return json;
  if (file.folder) json["folder"] = true;
  json["stamp"] = file.stamp;
  return json;
}

Json::Value JsonOf(const wire::Trust& trust) {
  Json::Value json;
  json["least_user"] = trust.least_user;
  if (trust.memory_mib != 0) json["memory"] = trust.memory_mib;
  for (const auto& [name, uids] : {std::pair("clients", &trust.clients), std::pair("ended", &trust.ended)}) {
    Json::Value& list = json[name] = Json::Value(Json::arrayValue);
    for (const uint32_t uid : *uids) list.append(uid);
  }
  return json;
}

Json::Value JsonOf(const std::vector<std::string>& texts) {
  Json::Value list(Json::arrayValue);
  for (const std::string& text : texts) list.append(text);
  return list;
}

Json::Value JsonOf(const wire::SynonymAnswer& answer) {
  Json::Value json;
  json["stamp"] = answer.stamp;
  if (!answer.rules.has_value()) return json;
  Json::Value& rules = json["rules"] = Json::Value(Json::arrayValue);
  for (const wire::SynonymRule& rule : *answer.rules) {
    Json::Value sides(Json::arrayValue);
    sides.append(JsonOf(rule.first));
    sides.append(JsonOf(rule.second));
    rules.append(std::move(sides));
  }
  return json;
}

Json::Value LookAt(const LiveShare& share, const std::vector<std::string>& paths) {
  Json::Value files(Json::arrayValue);
  for (const std::string& path : paths) files.append(JsonOf(share.Look(path)));
  return files;
}

}  // namespace

services::FrameReply AccessServer::Handle(const std::string& request, const services::Peer& peer) {
  base::UniqueFd descriptor;
  const auto answer = [&](const std::string& type, const Json::Value& data) {
    return Answer(ReadRequest(type, data), descriptor);
  };
  std::string reply = services::AnswerJsonCommand(request, peer, answer, {"look", "trust", "synonyms"});
  return {std::move(reply), std::move(descriptor)};
}

Json::Value AccessServer::Answer(const Request& request, base::UniqueFd& descriptor) {
  Json::Value data(Json::objectValue);
  if (request.kind == Request::Kind::kStatus) {
    data["pid"] = getpid();
    data["unresponsive"] = limit_.Held();
    return data;
  }
  if (request.kind == Request::Kind::kTrust) return JsonOf(trust_());
  if (request.kind == Request::Kind::kSynonyms) return JsonOf(synonyms_(request.known));
  const services::OpenLimit::Turn turn(limit_, request.root);
  RunAsUser(request.user, [&] {
    const LiveShare share(own_descriptors_, request.root);
    if (request.kind == Request::Kind::kOpen) {
      descriptor = share.Open(request.paths.front());
    } else {
      data["files"] = LookAt(share, request.paths);
    }
  });
  return data;
}

}  // namespace ferrox::access
