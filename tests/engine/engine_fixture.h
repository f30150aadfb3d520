#pragma once

#include <filesystem>
#include <memory>
#include <string>

#include <gtest/gtest.h>

#include "common/json_util.h"
#include "services/kovaelasticd/commands/engine.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {

/// An engine in this process, which is asked by requests.
class EngineTest : public testing::Test {
 protected:
  EngineTest() {
    std::filesystem::create_directories(folder_ / "state");
    Restart();
  }
  void Restart() {
    engine_.reset();
    engine_ = std::make_unique<Engine>(folder_ / "state");
  }
  Json::Value SendText(const std::string& request, uid_t uid = 0) {
    Json::Value reply;
    EXPECT_TRUE(fromString(reply, engine_->Handle(request, {uid, 0, 0})));
    return reply;
  }
  Json::Value Send(const std::string& command, const std::string& data = "{}") {
    return SendText(R"({"command":")" + command + R"(","data":)" + data + "}");
  }
  /// The code of the failure, 0 for success.
  int Code(const std::string& command, const std::string& data) { return CodeOf(Send(command, data)); }
  static int CodeOf(const Json::Value& reply) {
    if (reply["success"].asBool()) return 0;
    EXPECT_GT(reply["error"]["msg"].asString().size(), 15U) << toString(reply);
    return reply["error"]["code"].asInt();
  }
  int Create(const std::string& id, const std::string& name) {
    return Code("index_create", R"({"id":")" + id + R"(","path":")" + (folder_ / name) + "\"}");
  }
  int Put(const std::string& id, const std::string& path, const std::string& text) {
    return Code("document_upsert_by_id",
                R"({"id":")" + id + R"(","doc_id":")" + path + R"(","data":{"KOVAMDTextContent":")" + text + "\"}}");
  }
  int Commit(const std::string& id) { return Code("commit", R"({"id":")" + id + "\"}"); }
  int64_t Total(const std::string& query, const std::string& id = "") {
    const std::string where = id.empty() ? "" : R"(,"id":")" + id + "\"";
    return Send("search", R"({"query":")" + query + "\"" + where + "}")["data"]["total"].asInt64();
  }

  test::TempDir folder_;
  std::unique_ptr<Engine> engine_;
};

}  // namespace ferrox::engine
