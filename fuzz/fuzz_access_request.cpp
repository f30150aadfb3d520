// What is asked of kova-access, any bytes: it is refused, or is one user that is not root and paths within the bounds.
#include <algorithm>
#include <cstdint>
#include <string>

#include "common/json_util.h"
#include "services/kova-access/request.h"
#include "services/support/json_command.h"

namespace {

void Require(bool condition) {
  if (!condition) __builtin_trap();
}

bool IsPath(const std::string& text) { return text.starts_with('/') && text.find('\0') == std::string::npos; }

void RequireBounds(const ferrox::access::Request& request) {
  using Kind = ferrox::access::Request::Kind;
  if (request.kind == Kind::kStatus) return;
  const auto& groups = request.user.groups;
  Require(request.user.uid != 0 && request.user.uid != UINT32_MAX && !groups.empty());
  Require(std::find(groups.begin(), groups.end(), UINT32_MAX) == groups.end());
  Require(request.kind == Kind::kOpen ? request.paths.size() == 1 : request.paths.size() <= 2000);
  Require(IsPath(request.root) && std::all_of(request.paths.begin(), request.paths.end(), &IsPath));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string request(reinterpret_cast<const char*>(data), size);
  const auto command = [](const std::string& type, const Json::Value& members) {
    RequireBounds(ferrox::access::ReadRequest(type, members));
    return Json::Value();
  };
  Json::Value reply;
  Require(ferrox::fromString(reply, ferrox::services::AnswerJsonCommand(request, {}, command)));
  Require(reply["success"].isBool());
  return 0;
}
