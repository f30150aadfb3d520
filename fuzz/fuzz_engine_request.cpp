// Any request gets one reply that is JSON with "success", whatever was done to the indices before.
#include <cstdint>
#include <filesystem>
#include <string>

#include <json/value.h>

#include "common/json_util.h"
#include "fuzz/memory_folder.h"
#include "services/kovaelasticd/commands/engine.h"

namespace {

/// An engine in a folder of its own, with one index that requests can name.
class Fixture {
 public:
  Fixture() : folder_(ferrox::test::MakeMemoryFolder("fuzz_engine")), engine_(folder_) {
    (void)engine_.Handle(R"({"command":"index_create","data":{"id":"a","path":")" + folder_ + "/a\"}}", {});
    (void)engine_.Handle(R"({"command":"document_upsert_by_id","data":{"id":"a","doc_id":"/v/x.txt","data":{}}})", {});
  }
  ~Fixture() { std::filesystem::remove_all(folder_); }
  std::string Handle(const std::string& request) { return engine_.Handle(request, {}); }

 private:
  std::string folder_;
  ferrox::engine::Engine engine_;
};

/// Requests must not make folders all over the machine that fuzzes.
bool NamesAPath(const std::string& request) { return request.find("path\"") != std::string::npos; }

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static Fixture fixture;
  const std::string request(reinterpret_cast<const char*>(data), size);
  if (NamesAPath(request)) return 0;
  Json::Value reply;
  if (!ferrox::fromString(reply, fixture.Handle(request)) || !reply["success"].isBool()) __builtin_trap();
  if (!reply["success"].asBool() && reply["error"]["code"].asInt() < 1400) __builtin_trap();
  return 0;
}
