#include <cstdarg>

#include <json/value.h>

#include <kova/content_extract.h>
#include <kova/samba.h>
#include <kova/service.h>

#include "platform/shared/arguments.h"
#include "platform/shared/failure.h"
#include "tests/support/fake_platform.h"

using ferrox::test::FakeCallFails;
using ferrox::test::FakePlatform;
using ferrox::test::FakeProgram;

namespace {

int Switch(const char* name, bool on) {
  if (on) {
    FakePlatform::Get().running_services.insert(name);
  } else {
    FakePlatform::Get().running_services.erase(name);
  }
  return 0;
}

int Execute(const char* function, FakeProgram program) {
  std::string call = program.path;
  for (const std::string& argument : program.arguments) call += " " + argument;
  if (FakeCallFails(function, call)) return -1;
  FakePlatform::Get().executed.push_back(std::move(program));
  return FakePlatform::Get().exec_status;
}

}  // namespace

int KLIBServiceStart(const char* name, int now) {
  return FakeCallFails(__func__, std::string(name) + ", " + std::to_string(now)) ? -1 : Switch(name, true);
}
int KLIBServiceStop(const char* name, int now) {
  return FakeCallFails(__func__, std::string(name) + ", " + std::to_string(now)) ? -1 : Switch(name, false);
}
int KLIBServiceRestart(const char* name) { return FakeCallFails(__func__, name) ? -1 : Switch(name, true); }
int KLIBServicectlStart(const char* name, int kind) {
  return FakeCallFails(__func__, std::string(name) + ", " + std::to_string(kind)) ? -1 : Switch(name, true);
}
int KLIBServicectlStop(const char* name, int kind) {
  return FakeCallFails(__func__, std::string(name) + ", " + std::to_string(kind)) ? -1 : Switch(name, false);
}
int KLIBServiceIsRunning(const char* name) {
  if (FakeCallFails(__func__, name)) return -1;
  return static_cast<int>(FakePlatform::Get().running_services.count(name));
}

int KOVASMBIsEnableSpotlight() { return FakeCallFails(__func__, "") ? 0 : FakePlatform::Get().spotlight; }
int KOVASMBSetSpotlight(int enable) {
  if (FakeCallFails(__func__, std::to_string(enable))) return -1;
  FakePlatform::Get().spotlight = enable != 0 ? 1 : 0;
  return 0;
}

int KLIBCExec(const char* path, const char* argument, ...) {
  va_list more;
  va_start(more, argument);
  std::vector<std::string> arguments = kova::CollectArguments(argument, more);
  va_end(more);
  return Execute(__func__, {path, 0, std::move(arguments)});
}

int KLIBCExecl(const char* path, unsigned int options, const char* argument, ...) {
  va_list more;
  va_start(more, argument);
  std::vector<std::string> arguments = kova::CollectArguments(argument, more);
  va_end(more);
  return Execute(__func__, {path, options, std::move(arguments)});
}

void KOVA::CONTENT_EXTRACT::ParseFile(const std::string& path, const Json::Value& config, Json::Value& document) {
  FakePlatform& platform = FakePlatform::Get();
  if (FakeCallFails(__func__, path)) throw std::runtime_error("cannot parse " + path);
  platform.parsed.emplace_back(path, config);
  if (platform.parse_file) return platform.parse_file(path, config, document);
  const size_t slash = path.rfind('/');
  document["KOVAMDPath"] = path;
  document["KOVAMDParent"] = path.substr(0, slash == std::string::npos ? 0 : slash);
  document["KOVAMDFSName"] = path.substr(slash + 1);
  document["KOVAMDIsDir"] = false;
}

std::string KOVA::CONTENT_EXTRACT::ExtractionProblem() { return FakePlatform::Get().extraction_problem; }
