// Catches answers to ordinary users that tell of what they may not read, or that show what is no longer on the disk.
#include <functional>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "tests/engine/engine_fixture.h"
#include "wire/engine_requests.h"

namespace ferrox::engine {
namespace {

constexpr uid_t kUser = 54321;
constexpr char kStamp[] = "5.1.2.77";

/// An engine that looks at a disk of the test's own.
class UserSearchTest : public EngineTest {
 protected:
  UserSearchTest() {
    engine_.reset();
    engine_ =
        std::make_unique<Engine>(folder_ / "state", [this](const Asker& asker, const std::vector<std::string>& paths) {
          EXPECT_EQ(asker.uid, kUser);
          std::vector<wire::LiveFile> files;
          for (const std::string& path : paths) files.push_back(Look(asker, path));
          return files;
        });
  }
  wire::LiveFile Look(const Asker& asker, const std::string& path) {
    if (unreachable_) throw Error(Error::kEngineRightsUnknown, "kova-access does not run");
    if (closed_.contains(path)) return {};
    const bool folder = path == asker.share_root || path.ends_with("/d");
    return {true, folder, path == asker.share_root, stamps_.contains(path) ? stamps_[path] : kStamp};
  }
  /// A document that everybody may read by its record.
  void PutFile(const std::string& id, const std::string& path, bool is_folder = false) {
    Json::Value document;
    document["KOVAMDTextContent"] = "common words";
    document["KOVAMDIsDir"] = is_folder;
    document["_KOVAStamp"] = kStamp;
    document["_KOVAAccess"] = is_folder ? "0:0:0755" : "0:0:0644";
    document["_KOVAExtractError"] = "not text";
    EXPECT_EQ(CodeOf(SendText(toString(wire::UpsertDocumentRequest(id, path, document)))), 0);
  }
  void PutShare(const std::string& name, int files) {
    const std::string root = "/v/" + name;
    ASSERT_EQ(Create(name, name), 0);
    ASSERT_EQ(CodeOf(SendText(toString(wire::IndexShareRequest(name, {name, root})))), 0);
    PutFile(name, root, true);
    for (int i = 0; i < files; ++i) PutFile(name, root + "/f" + std::to_string(1000 + i));
    ASSERT_EQ(Commit(name), 0);
  }
  std::string SearchText(const std::string& members = "", const std::string& query = "common -kind:folder") {
    const std::string text = R"({"command":"search","data":{"query":")" + query + "\"" + members + "}}";
    return engine_->Handle(text, {kUser, 100, 1, {200}});
  }
  Json::Value Search(const std::string& members = "", const std::string& query = "common -kind:folder") {
    Json::Value reply;
    EXPECT_TRUE(fromString(reply, SearchText(members, query)));
    return reply;
  }

  std::set<std::string> closed_;               ///< paths that the user may not open
  std::map<std::string, std::string> stamps_;  ///< of other files than when they were indexed
  bool unreachable_ = false;
};

TEST_F(UserSearchTest, SharesThatCannotBeEnteredDoNotExist) {
  PutShare("open", 3);
  const std::string all = SearchText();
  const std::string none = SearchText(R"(,"shares":["other"])");
  PutShare("other", 2);
  closed_.insert("/v/other");
  EXPECT_EQ(SearchText(), all);
  EXPECT_EQ(SearchText(R"(,"shares":["other"])"), none);
  EXPECT_EQ(CodeOf(Search(R"(,"shares":["open","other"])")), 1404);
  closed_.clear();
  EXPECT_EQ(Search()["data"]["total"], 5);
  const Json::Value one = Search(R"(,"shares":["other","other"])")["data"];
  EXPECT_EQ(one["total"], 2);
  EXPECT_EQ(one["hits"][0]["share"], "other");
  EXPECT_EQ(Send("search", R"({"query":"common -kind:folder","shares":["other"]})")["data"]["total"], 2);
  // A path as people see it, and the same below a share that is there for nobody else.
  EXPECT_EQ(Search("", "path:/other -kind:folder")["data"]["total"], 2);
  EXPECT_FALSE(Search("", "path:/v/other/f1000 path:/other/f1000")["data"].isMember("hints"));
  closed_.insert("/v/other");
  std::string hidden = SearchText("", "path:/other/f1000");
  EXPECT_EQ(hidden.replace(hidden.find("/other"), 6, "/none0"), SearchText("", "path:/none0/f1000"));
  closed_.clear();
  // An index of which no share is known, be it that of a share that was renamed.
  ASSERT_EQ(CodeOf(SendText(toString(wire::ConfigureIndexRequest("other", "renamed", folder_ / "other")))), 0);
  EXPECT_EQ(SearchText(), all);
}

TEST_F(UserSearchTest, AnswersAreOfTheUserWhoeverSendsThem) {
  PutShare("open", 3);
  const std::string as = R"(,"as":{"uid":54321,"groups":[200,100]})";
  for (const char* members : {"", R"(,"shares":["none"])", R"(,"shares":["none",7])", R"(,"ids":["open"])"}) {
    SCOPED_TRACE(members);
    const std::string text = R"({"command":"search","data":{"query":"common")" + as + members + "}}";
    EXPECT_EQ(engine_->Handle(text, {0, 0, 1}), SearchText(members, "common"));
  }
  EXPECT_EQ(CodeOf(Search(as)), 1406);
  for (const char* bad : {R"({"uid":0,"groups":[1]})", R"({"uid":-1,"groups":[1]})", R"({"uid":7,"groups":[]})", "7"}) {
    EXPECT_EQ(Code("search", R"({"query":"a","as":)" + std::string(bad) + "}"), 1403) << bad;
  }
  const Json::Value found = Search()["data"];
  EXPECT_EQ(found.getMemberNames(), (std::vector<std::string>{"hits", "left_out", "next_offset", "total"}));
  EXPECT_EQ(found["hits"][0].getMemberNames(),
            (std::vector<std::string>{"doc_id", "fields", "score", "share", "snippet", "title"}));
  for (const std::string& name : found["hits"][0]["fields"].getMemberNames()) EXPECT_EQ(name.rfind("KOVAMD", 0), 0U);
}

TEST_F(UserSearchTest, WhatIsNotSearchedIsSaidWithoutNamingAFile) {
  PutShare("open", 1);
  PutShare("paused", 1);
  PutShare("refused", 1);
  PutShare("remade", 1);
  ASSERT_EQ(CodeOf(SendText(toString(wire::IndexShareRequest("refused", {"refused", "/v/refused", "no POSIX"})))), 0);
  ASSERT_EQ(Code("index_pause", R"({"id":"paused"})"), 0);
  ASSERT_EQ(Code("index_rebuild", R"({"id":"remade"})"), 0);
  const Json::Value found = Search()["data"];
  EXPECT_EQ(found["total"], 1);
  std::string left_out;
  for (const Json::Value& entry : found["left_out"]) {
    const std::string share = entry["share"].asString();
    left_out += share + " " + entry["code"].asString() + (entry["searched"].asBool() ? " searched\n" : "\n");
    EXPECT_EQ(entry["reason"].asString().find('/'), std::string::npos);
    if (entry["searched"].asBool()) continue;
    const Json::Value alone = Search(R"(,"shares":[")" + share + "\"]")["error"];
    EXPECT_EQ(alone["code"], entry["code"]);
    EXPECT_EQ(alone["msg"], entry["reason"]);
  }
  EXPECT_EQ(left_out, "paused 1409\nrefused 1406\nremade 1410 searched\n");
  unreachable_ = true;
  const std::string unknown = SearchText();
  EXPECT_EQ(CodeOf(Search()), 1413);
  EXPECT_EQ(SearchText(R"(,"shares":["open"])"), unknown);
  EXPECT_EQ(SearchText(R"(,"shares":["none"])"), unknown);
}

TEST_F(UserSearchTest, HitsThatAreNoLongerSoOnTheDiskAreDroppedAndThePageFilled) {
  PutShare("open", 120);
  PutFile("open", "/v/open/d", true);
  ASSERT_EQ(Commit("open"), 0);
  const std::string by_name = R"(,"sort":"name","limit":10)";
  closed_ = {"/v/open/f1000", "/v/open/f1001"};
  stamps_["/v/open/f1002"] = "5.1.3.77";  // changed, though it may be read
  stamps_["/v/open/f1003"] = "5.1.2.78";  // another file took the name
  const Json::Value first = Search(by_name)["data"];
  EXPECT_EQ(first["hits"].size(), 10U);
  EXPECT_EQ(first["hits"][0]["doc_id"], "/v/open/f1004");
  EXPECT_EQ(first["next_offset"], 14);
  EXPECT_EQ(first["total"], 116);
  const Json::Value second = Search(by_name + R"(,"offset":14)")["data"];
  EXPECT_EQ(second["hits"][0]["doc_id"], "/v/open/f1014");
  EXPECT_EQ(second["next_offset"], 24);
  // All of a page and what is behind it: the rounds end, and the reply says where to go on.
  for (int i = 0; i < 110; ++i) closed_.insert("/v/open/f" + std::to_string(1000 + i));
  Json::Value page = Search(R"(,"sort":"name","limit":1)")["data"];
  EXPECT_EQ(page["hits"].size(), 1U);
  EXPECT_EQ(page["next_offset"], 111);
  for (int i = 110; i < 120; ++i) closed_.insert("/v/open/f" + std::to_string(1000 + i));
  page = Search(by_name)["data"];
  EXPECT_EQ(page["hits"].size(), 0U);
  EXPECT_EQ(page["total"], 0);
  EXPECT_EQ(page["next_offset"], 120);
  // Of a folder only the inode counts: what is in it changes its times.
  stamps_["/v/open/d"] = "9.9.9.77";
  EXPECT_EQ(Search("", "name:d")["data"]["total"], 1);
  stamps_["/v/open/d"] = "9.9.9.78";
  EXPECT_EQ(Search("", "name:d")["data"]["total"], 0);
}

TEST_F(UserSearchTest, OneDocumentIsShownOrNothingIsSaidOfIt) {
  PutShare("open", 2);
  PutShare("other", 1);
  const auto show = [this](const std::string& path) {
    return engine_->Handle(R"({"command":"show","data":{"text":true,"path":")" + path + "\"}}", {kUser, 100, 1});
  };
  const std::string shown = show("/v/open/f1000");
  EXPECT_NE(shown.find("common words"), std::string::npos);
  EXPECT_EQ(shown.find("\"_KOVA"), std::string::npos);
  EXPECT_EQ(show("/open/f1000"), shown);
  EXPECT_EQ(toString(Send("show", R"({"text":true,"path":"/open/f1000"})")) + "\n", shown + "\n");
  EXPECT_EQ(Code("show", R"({"path":"/open/f1009"})"), 1405);
  EXPECT_EQ(show("/open/f1001").find("1405"), std::string::npos);
  const auto refused = [&show](const std::string& path) {
    std::string text = show(path);
    EXPECT_NE(text.find("1405"), std::string::npos) << text;
    return text.replace(text.find(path), path.size(), "PATH");
  };
  closed_ = {"/v/open/f1000", "/v/other"};
  stamps_["/v/open/f1001"] = "5.1.3.77";
  Json::Value unrecorded;
  unrecorded["_KOVAStamp"] = kStamp;
  ASSERT_EQ(CodeOf(SendText(toString(wire::UpsertDocumentRequest("open", "/v/open/unrecorded", unrecorded)))), 0);
  const std::string reply = refused("/v/none");
  for (const char* path : {"/v/open/f1000", "/v/open/f1001", "/v/open/unrecorded", "/open/none", "/v/other/f1000",
                           "/other/f1000", "/other", "/v/openf1000", "/"}) {
    EXPECT_EQ(refused(path), reply) << path;
  }
}

}  // namespace
}  // namespace ferrox::engine
