// Catches requests that the engine answers with the wrong code, and changes and pages of hits that get lost.
#include "services/kovaelasticd/commands/engine.h"

#include <sys/stat.h>
#include <unistd.h>

#include <set>
#include <vector>

#include "services/kovaelasticd/store/sqlite_db.h"
#include "tests/engine/engine_fixture.h"
#include "wire/engine_requests.h"

namespace ferrox::engine {
namespace {

TEST_F(EngineTest, BadRequestsAreAnsweredWithTheirCode) {
  ASSERT_EQ(Create("a", "a"), 0);
  const struct {
    const char* command;
    const char* data;
    int code;
  } kRows[] = {
      {"no_such_command", "{}", 1402},
      {"commit", "{}", 1403},
      {"commit", R"({"id":7})", 1403},
      {"commit", R"({"id":"none"})", 1404},
      {"index_stat", R"({"id":"none"})", 1404},
      {"index_create", R"({"id":"b","path":"relative"})", 1403},
      {"index_create", R"({"id":"","path":"/x"})", 1403},
      {"index_create", R"({"id":"b","path":"/x","mappings":{"properties":{"F":{"type":"blob"}}}})", 1403},
      {"index_create", R"({"id":"a","path":"/elsewhere"})", 1408},
      {"index_config_set", R"({"id":"a","data":{}})", 1403},
      {"document_upsert_by_id", R"({"id":"a","doc_id":"x","data":{}})", 1403},
      {"document_upsert_by_id", R"({"id":"a","doc_id":"/x","data":[]})", 1403},
      {"document_upsert_by_id", R"({"id":"a","doc_id":"/x","data":{"KOVAMDPath":"/y"}})", 1403},
      {"document_set_by_id", R"({"id":"a","doc_id":"/x","data":{"KOVAMDPath":"y"}})", 1403},
      {"document_set_by_id", R"({"id":"a","doc_id":"/x","data":{"KOVAMDTitle":"t"}})", 1405},
      {"document_get_by_query", R"({"id":"a","query":{"qsl":{"match":{}}}})", 1403},
      {"document_get_by_query", R"({"id":"a","query":{"qsl":{"prefix":{"KOVAMDPath":"/"}},"load_field":[1]}})", 1403},
      {"document_del_by_query", R"({"id":"a","query":{"qsl":{"prefix":{"KOVAMDTitle":"/"}}}})", 1403},
      {"document_del_by_query", R"({"id":"a","query":{"qsl":{"unread":true}}})", 1403},
      {"document_del_by_query", R"({"id":"a","query":{"qsl":{"term":{"KOVAMDParent":"/v"}}}})", 1403},
      {"folder_digests", R"({"id":"a","path":"/v"})", 1403},
      {"folder_digests", R"({"id":"a","path":"v","seed":1})", 1403},
      {"folder_digests", R"({"id":"a","path":"/v","seed":1})", 0},
      {"index_share", R"({"id":"none","share":"s","root":"/s"})", 1404},
      {"index_share", R"({"id":"a","share":"s/t","root":"/s"})", 1403},
      {"index_share", R"({"id":"a","share":"s","root":"s"})", 1403},
      {"index_share", R"({"id":"a","share":"s","root":"/s","rules":[]})", 1403},
      {"update_term_suggestion", R"({"doc_id_field":"KOVAMDTitle","db_name":"none"})", 1404},
      {"search", R"({"query":"a","limit":1001})", 1403},
      {"search", R"({"query":"a","sort":"colour"})", 1403},
      {"search", R"({"query":"a","offset":-1})", 1403},
      {"search", R"({"query":"a","id":"none"})", 1404},
      {"search", R"({"query":"size:big"})", 1403},
      {"search", R"({})", 1403},
      {"document_del_by_id", R"({"id":"a","doc_id":"/never/there"})", 0},
      {"ping", "{}", 0},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(std::string(row.command) + " " + row.data);
    EXPECT_EQ(Code(row.command, row.data), row.code);
  }
  for (const char* text :
       {"", "[]", "{}", "{\"command\":1}", "{\"compound\":{}}", "{\"compound\":[1]}", "\xFF",
        "{\"command\":\"ping\",\"data\":[]}", "{\"compound\":[{\"compound\":[]}]}",
        R"({"compound":[{"command":"ping"}],"x":1})", R"({"compound":[{"command":"ping"},]})",
        R"({"compound":[{"command":"ping"}]}x)", R"({"compound":[{"command":"ping"} 1]})",
        R"({"compound":[{"command":"ping"})", R"({"compound":[{"command":"ping"},{"command":"p]})"}) {
    SCOPED_TRACE(text);
    EXPECT_EQ(CodeOf(SendText(text)), 1403);
  }
  EXPECT_EQ(CodeOf(SendText(std::string(100000, '['))), 1403);
}

TEST_F(EngineTest, FieldsMustHaveTheTypeOfTheMappings) {
  const std::string mappings = R"({"property_id":"KOVAMDPath","default":{"type":"string","_all":true},"properties":
      {"KOVAMDFSSize":{"type":"int"},"KOVAMDTitle":{"type":"text"},"KOVAMDIsDir":{"type":"bool","_all":false},
       "Hidden":{"_all":false}}})";
  ASSERT_EQ(Code("index_create", R"({"id":"m","path":")" + (folder_ / "m") + R"(","mappings":)" + mappings + "}"), 0);
  const auto put = [this](const std::string& document) {
    return Code("document_upsert_by_id", R"({"id":"m","doc_id":"/v/x","data":)" + document + "}");
  };
  EXPECT_EQ(put(R"({"KOVAMDFSSize":"12"})"), 1403);
  EXPECT_EQ(put(R"({"KOVAMDTitle":5})"), 1403);
  EXPECT_EQ(put(R"({"KOVAMDIsDir":"no"})"), 1403);
  EXPECT_EQ(put(R"({"KOVAMDFSSize":5000000000,"KOVAMDTitle":["a","b"],"Other":{"x":1},"Hidden":"cloak"})"), 0);
  EXPECT_EQ(Commit("m"), 0);
  EXPECT_EQ(Total("cloak"), 0);
  EXPECT_EQ(Total("b size:5000000000"), 1);
  Restart();  // the mappings last
  EXPECT_EQ(put(R"({"KOVAMDFSSize":"12"})"), 1403);
}

TEST_F(EngineTest, OrdinaryUsersHaveTheirOwnCommandsAlone) {
  EXPECT_EQ(CodeOf(SendText(R"({"command":"ping"})", 54321)), 0);
  EXPECT_EQ(CodeOf(SendText(R"({"command":"index_list"})", 54321)), 1406);
  EXPECT_EQ(CodeOf(SendText(R"({"compound":[{"command":"ping"}]})", 54321)), 1406);
  EXPECT_EQ(CodeOf(SendText(R"({"command":"index_list"})", geteuid())), 0);
}

TEST_F(EngineTest, ANotedShareLastsUntilTheIndexGetsAnotherId) {
  ASSERT_EQ(Create("a", "a"), 0);
  const ShareNote note{"photo", "/volume1/photo", "it is a snapshot", Json::Value(Json::objectValue)};
  const Json::Value sent = wire::IndexShareRequest("a", {"photo", "/volume1/photo/", note.refused, note.rules});
  EXPECT_EQ(CodeOf(SendText(toString(sent))), 0);
  const auto noted = [this] {
    engine_.reset();
    const std::vector<Registry::Listed> listed = Registry(folder_ / "state").List();
    Restart();
    return listed.at(0).share;
  };
  ASSERT_NE(noted(), nullptr);
  EXPECT_TRUE(*noted() == note);
  EXPECT_EQ(CodeOf(SendText(toString(wire::ConfigureIndexRequest("a", "a", folder_ / "other")))), 0);
  EXPECT_NE(noted(), nullptr);
  EXPECT_EQ(CodeOf(SendText(toString(wire::ConfigureIndexRequest("a", "b", folder_ / "other")))), 0);
  EXPECT_EQ(noted(), nullptr);
}

TEST_F(EngineTest, CompoundsGoOnAfterAFailedPart) {
  ASSERT_EQ(Create("a", "a"), 0);
  const Json::Value reply = SendText(R"({"compound":[
      {"command":"document_upsert_by_id","data":{"id":"a","doc_id":"/v/1","data":{}}},
      {"command":"document_set_by_id","data":{"id":"a","doc_id":"/v/none","data":{}}},
      {"command":"document_upsert_by_id","data":{"id":"none","doc_id":"/v/2","data":{}}},
      {"command":"document_upsert_by_id","data":{"id":"a","doc_id":"/v/3","data":{}}},
      {"command":"commit","data":{"id":"a"}}]})");
  EXPECT_TRUE(reply["success"].asBool());
  EXPECT_TRUE(reply["has_fail"].asBool());
  std::string codes;
  for (const Json::Value& part : reply["data"]) codes += std::to_string(CodeOf(part)) + " ";
  EXPECT_EQ(codes, "0 1405 1404 0 0 ");
  EXPECT_EQ(Total("path:/v"), 2);
  const Json::Value empty = SendText(R"({"compound":[]})");
  EXPECT_TRUE(empty["data"].isArray() && !empty["has_fail"].asBool());
  const Json::Value marks = SendText(
      " { \"compound\" : [ {\"data\":{\"x\":\"\\\\\\\"]},[\"},\"command\":\"ping\"} ,\n"
      "{\"command\":\"ping\"} ] } ");
  EXPECT_EQ(marks["data"].size(), 2U) << toString(marks);
}

TEST_F(EngineTest, AFolderMovesWithAllBelowIt) {
  ASSERT_EQ(0, Create("a", "a"));
  EXPECT_EQ(0, Code("document_upsert_by_id",
                    R"({"id":"a","doc_id":"/v/old","data":{"KOVAMDParent":"/v","_KOVAStamp":"1.1.1.7"}})"));
  for (const char* path : {"/v/old/x", "/v/old/deep/y", "/v/older"}) ASSERT_EQ(0, Put("a", path, "word"));
  const auto move = [this](const std::string& from, const std::string& to, const std::string& stamp) {
    return Code("folder_move", R"({"id":"a","doc_id":")" + from + R"(","stamp":")" + stamp +
                                   R"(","data":{"KOVAMDPath":")" + to + "\"}}");
  };
  EXPECT_EQ(Error::kEngineNoSuchDocument, move("/v/old", "/v/new", "1.1.1.8")) << "another folder by now";
  EXPECT_EQ(Error::kEngineNoSuchDocument, move("/v/none", "/v/new", ""));
  for (const char* to : {"/v/old", "/v/old/deep/in", "/v", "new"}) {
    EXPECT_EQ(Error::kEngineBadRequest, move("/v/old", to, "")) << to;
  }
  EXPECT_EQ(0, move("/v/old", "/w/new", "1.1.1.7"));
  EXPECT_EQ(Error::kEngineNoSuchDocument, move("/v/old", "/w/new", "1.1.1.7")) << "done already, it changes nothing";
  EXPECT_EQ(0, Commit("a"));
  EXPECT_EQ(3, Total("path:/w/new"));
  EXPECT_EQ(1, Total("word path:/w/new/deep"));
  EXPECT_EQ(1, Total("path:/v"));
}

TEST_F(EngineTest, RightsAreSetForAllRecordsOrNone) {
  ASSERT_EQ(0, Create("a", "a"));
  const auto set = [this](const std::string& records) {
    return Send("access_set", R"({"id":"a","records":)" + records + "}");
  };
  const auto record = [](const std::string& path, const std::string& stamp, const std::string& access) {
    return R"({"path":")" + path + R"(","stamp":")" + stamp + R"(","access":")" + access + "\"}";
  };
  for (const char* path : {"/v/x", "/v/y"}) {
    ASSERT_EQ(0, Code("document_upsert_by_id",
                      R"({"id":"a","doc_id":")" + std::string(path) + R"(","data":{"_KOVAStamp":"1.1.1.7"}})"));
  }
  const std::string good = record("/v/x", "1.1.5000000000.7", "1000:100:0640:u5001=4,g=4,g200=6");
  for (const std::string& bad :
       {record("v/y", "1.1.2.7", "0:0:0644"), record("/v/y", "1.1.7", "0:0:0644"),
        record("/v/y", "1.1.2.7x", "0:0:0644"), record("/v/y", "1.1.2.7", ""), record("/v/y", "1.1.2.7", "0:0:644"),
        record("/v/y", "1.1.2.7", "00:0:0644"), record("/v/y", "1.1.2.7", "0:0:10644"),
        record("/v/y", "1.1.2.7", "0:0:0644:"), record("/v/y", "1.1.2.7", "0:0:0644:u5=4"),
        record("/v/y", "1.1.2.7", "0:0:0644:g5=4,g=4"), record("/v/y", "1.1.2.7", "0:0:0644:g=8"),
        record("/v/y", "1.1.2.7", "4294967296:0:0644"), std::string(R"({"path":"/v/y","stamp":"1.1.2.7"})"),
        std::string("1")}) {
    const Json::Value reply = set("[" + good + "," + bad + "]");
    EXPECT_EQ(Error::kEngineBadRequest, CodeOf(reply)) << bad;
    EXPECT_NE(reply["error"]["msg"].asString().find("position 1: "), std::string::npos) << toString(reply);
  }
  EXPECT_EQ(Error::kEngineBadRequest, CodeOf(set("{}")));
  EXPECT_EQ(Error::kEngineBadRequest,
            Code("document_set_by_id", R"({"id":"a","doc_id":"/v/x","data":{"_KOVAAccess":1}})"));
  ASSERT_EQ(0, Commit("a"));
  EXPECT_EQ(Send("index_stat", R"({"id":"a"})")["data"]["without_access"].asInt(), 2);
  const Json::Value reply =
      set("[" + record("/v", "9.9.9.9", "0:0:0755") + "," + good + "," + record("/v/y", "2.1.1.7", "0:0:0600") + "]");
  EXPECT_EQ(toString(reply["data"]), R"({"differing":[2],"missing":[0]})");
  ASSERT_EQ(0, Commit("a"));
  EXPECT_EQ(Send("index_stat", R"({"id":"a"})")["data"]["without_access"].asInt(), 0);
  EXPECT_EQ(Total("owner:1000 group:100"), 1) << "of the differing one, nothing else is set";
  const Json::Value found = Send("search", R"({"query":"path:/v/x"})")["data"]["hits"][0]["fields"];
  EXPECT_EQ(found["KOVAMDAttributeChangeDate"].asInt(), 5);
  EXPECT_FALSE(found.isMember("_KOVAAccess")) << "who may read it is nobody's business";
  const Json::Value suspects = Send("document_get_by_query", R"({"id":"a","query":{"qsl":{"suspects":true}}})")["data"];
  EXPECT_EQ(suspects.size(), 1U) << "of the other name of the file it is not known yet";
}

TEST_F(EngineTest, IndicesPauseMoveRenameAndGo) {
  ASSERT_EQ(Create("a", "a"), 0);
  EXPECT_EQ(Create("a", "a"), 0) << "the same again";
  EXPECT_EQ(Create("b", "a"), 1408) << "the folder is taken";
  ASSERT_EQ(Put("a", "/v/1", "lantern"), 0);
  EXPECT_EQ(Code("index_pause", R"({"id":"a"})"), 0);
  EXPECT_EQ(Code("index_pause", R"({"id":"a"})"), 0);
  EXPECT_EQ(Put("a", "/v/2", "x"), 1409);
  EXPECT_EQ(Code("search", R"({"id":"a","query":"x"})"), 1409);
  Restart();
  EXPECT_EQ(Commit("a"), 1409) << "still paused";
  EXPECT_EQ(Code("index_resume", R"({"id":"a"})"), 0);
  EXPECT_EQ(Total("lantern", "a"), 1) << "pausing commits";
  EXPECT_EQ(Code("index_pause", R"({"id":"a"})"), 0);
  ASSERT_EQ(Create("a", "a"), 0);
  EXPECT_EQ(Total("lantern", "a"), 1) << "what is created can be used";
  ASSERT_EQ(Put("a", "/v/3", "lantern"), 0);
  EXPECT_EQ(Code("index_config_set", R"({"id":"a","data":{"id":"b","path":")" + (folder_ / "deep/b") + "\"}}"), 0);
  EXPECT_EQ(Commit("a"), 1404);
  EXPECT_EQ(Total("lantern", "b"), 2);
  EXPECT_FALSE(std::filesystem::exists(folder_ / "a"));
  struct stat here = {};
  struct stat there = {};
  const bool other_volume = stat(folder_.Path().c_str(), &here) == 0 && stat("/dev/shm", &there) == 0 &&
                            here.st_dev != there.st_dev && access("/dev/shm", W_OK) == 0;
  if (other_volume) {
    const test::TempDir volume("/dev/shm");
    EXPECT_EQ(Code("index_config_set", R"({"id":"b","data":{"path":")" + (volume / "b") + "\"}}"), 0);
    EXPECT_FALSE(std::filesystem::exists(folder_ / "deep/b"));
    Restart();
    EXPECT_EQ(Total("lantern"), 2) << "from another volume";
    EXPECT_EQ(Code("index_config_set", R"({"id":"b","data":{"path":")" + (folder_ / "deep/b") + "\"}}"), 0);
  }
  Restart();
  EXPECT_EQ(Total("lantern"), 2);
  EXPECT_EQ(Code("index_delete", R"({"id":"b"})"), 0);
  EXPECT_FALSE(std::filesystem::exists(folder_ / "deep/b"));
  EXPECT_EQ(Total("lantern"), 0);
}

TEST_F(EngineTest, AnUnusableIndexDoesNotHideTheOthers) {
  ASSERT_EQ(Create("good", "good"), 0);
  ASSERT_EQ(Create("bad", "bad"), 0);
  ASSERT_EQ(Put("good", "/v/1", "lantern"), 0);
  ASSERT_EQ(Commit("good"), 0);
  engine_.reset();
  Database(folder_ / "bad/index.sqlite", Database::Mode::kWrite).Execute("PRAGMA user_version = 99");
  Restart();
  const Json::Value reply = Send("search", R"({"id":"bad","query":"lantern"})");
  EXPECT_EQ(CodeOf(reply), 1407);
  EXPECT_NE(reply["error"]["msg"].asString().find(folder_ / "bad/index.sqlite"), std::string::npos);
  ASSERT_EQ(Create("paused", "paused"), 0);
  ASSERT_EQ(Code("index_pause", R"({"id":"paused"})"), 0);
  // Searched in all and in some; what could not be is named.
  for (const std::string ids : {"", R"(,"ids":["none","good","paused","bad"])"}) {
    const Json::Value some = Send("search", R"({"query":"lantern")" + ids + "}")["data"];
    EXPECT_EQ(some["total"].asInt(), 1);
    std::set<std::string> left_out;
    for (const Json::Value& entry : some["left_out"]) {
      EXPECT_GT(entry["reason"].asString().size(), 15U);
      left_out.insert(entry["id"].asString() + " " + entry["code"].asString());
    }
    std::set<std::string> expected = {"bad 1407", "paused 1409"};
    if (!ids.empty()) expected.insert("none 1404");
    EXPECT_EQ(left_out, expected);
  }
  EXPECT_TRUE(Send("search", R"({"query":"lantern","id":"good"})")["data"]["left_out"].empty());
  EXPECT_TRUE(Send("index_list")["data"][0].isMember("error"));
  EXPECT_EQ(Code("index_delete", R"({"id":"bad"})"), 0);
  EXPECT_EQ(Create("bad", "bad"), 0);
}

TEST_F(EngineTest, LostChangesFailTheNextCommit) {
  ASSERT_EQ(Create("a", "a"), 0);
  ASSERT_EQ(Put("a", "/v/1", "lantern"), 0);
  ASSERT_EQ(Commit("a"), 0);
  EXPECT_FALSE(std::filesystem::exists(folder_ / "a/uncommitted"));
  ASSERT_EQ(Put("a", "/v/2", "lantern"), 0);
  EXPECT_TRUE(std::filesystem::exists(folder_ / "a/uncommitted"));
  engine_.reset();  // an orderly end commits
  EXPECT_FALSE(std::filesystem::exists(folder_ / "a/uncommitted"));
  test::WriteFile(folder_ / "a/uncommitted", "");  // what a killed engine leaves
  Restart();
  EXPECT_EQ(Total("lantern"), 2);
  EXPECT_EQ(Commit("a"), 1407);
  EXPECT_EQ(Commit("a"), 0) << "said once";
}

TEST_F(EngineTest, IndicesWithoutAllWordsAddNothingWhereOthersHaveThem) {
  for (const std::string id : {"a", "b"}) {
    ASSERT_EQ(Create(id, id), 0);
    for (int i = 0; i < 12; ++i) ASSERT_EQ(Put(id, "/v/" + id + "/" + std::to_string(i), "filler"), 0);
    ASSERT_EQ(Put(id, "/v/" + id + "/some", "lantern"), 0);
  }
  ASSERT_EQ(Put("a", "/v/a/all", "lantern harbour"), 0);
  ASSERT_EQ(Commit("a") + Commit("b"), 0);
  const auto search = [this](const std::string& members) {
    return Send("search", R"({"query":"lantern harbour filler",)" + members + "}")["data"];
  };
  const Json::Value some = search(R"("ids":["a","b"])");
  EXPECT_EQ(some["total"], 3);
  EXPECT_EQ(some["total_all"], 0);
  EXPECT_EQ(some["ignored"][0], "filler");
  EXPECT_EQ(some["hits"][0]["doc_id"], "/v/a/all");
  EXPECT_EQ(search(R"("ids":["a","b"],"all_words":true)")["none_has_all"], true);
  ASSERT_EQ(Put("a", "/v/a/all", "lantern harbour filler"), 0);
  ASSERT_EQ(Commit("a"), 0);
  EXPECT_EQ(search(R"("ids":["a","b"])")["total_all"], 1);
  for (const char* members : {R"("ids":["a","b"],"all_words":true)", R"("ids":["b","a"],"sort":"name")"}) {
    const Json::Value all = search(members);
    EXPECT_EQ(all["total"], 1) << members;
    EXPECT_FALSE(all.isMember("none_has_all") || all.isMember("total_all")) << members;
  }
  EXPECT_EQ(search(R"("ids":["b"],"all_words":true)")["none_has_all"], true);
}

TEST_F(EngineTest, AWordThatAnotherIndexHoldsIsNotRepaired) {
  ASSERT_EQ(Create("a", "a") + Create("b", "b"), 0);
  for (int i = 0; i < 30; ++i) ASSERT_EQ(Put("a", "/v/a/" + std::to_string(i), "the licence"), 0);
  for (int i = 0; i < 3; ++i) ASSERT_EQ(Put("b", "/v/b/" + std::to_string(i), i == 0 ? "the lisence" : "nothing"), 0);
  ASSERT_EQ(Commit("a") + Commit("b"), 0);
  const auto search = [this] { return Send("search", R"({"query":"lisence","ids":["a","b"]})")["data"]; };
  EXPECT_EQ(toString(search()["repaired"]), R"([{"also":true,"from":"lisence","to":"licence"}])");
  EXPECT_EQ(search()["hits"][0]["doc_id"], "/v/b/0") << "what has the word as it was typed comes first";
  for (int i = 1; i < 3; ++i) ASSERT_EQ(Put("b", "/v/b/" + std::to_string(i), "the lisence"), 0);
  ASSERT_EQ(Commit("b"), 0);
  EXPECT_EQ(search()["total"], 3);
  EXPECT_FALSE(search().isMember("repaired"));
}

TEST_F(EngineTest, SynonymsAreToldWhereTheyWereNeededAndWhenAsked) {
  const auto synonyms = std::make_shared<const Synonyms>(std::vector<Synonyms::Rule>{{{"car"}, {"automobile"}}});
  engine_.reset();
  engine_ = std::make_unique<Engine>(folder_ / "state", &LookOnDisk, UserSources(), [synonyms] { return synonyms; });
  ASSERT_EQ(Create("a", "a") + Put("a", "/v/a/1", "an automobile"), 0);
  const auto told = [this](const std::string& members) {
    EXPECT_EQ(Commit("a"), 0);
    return toString(Send("search", R"({"query":"car")" + members + "}")["data"]["synonyms"]);
  };
  EXPECT_EQ(told(""), R"([{"from":"car","to":"automobile"}])");
  ASSERT_EQ(Put("a", "/v/a/2", "a car"), 0);
  EXPECT_EQ(told(""), "null");
  EXPECT_EQ(told(R"(,"explain":true)"), R"([{"also":true,"from":"car","to":"automobile"}])");
  ASSERT_EQ(Put("a", "/v/a/1", "nothing"), 0);
  EXPECT_EQ(told(R"(,"explain":true)"), "null");
}

TEST_F(EngineTest, SearchMergesIndicesAndPages) {
  for (const std::string id : {"a", "b"}) {
    ASSERT_EQ(Create(id, id), 0);
    for (int i = 0; i < 5; ++i) {
      const std::string date = std::to_string(i * 2 + (id == "b" ? 1 : 0));
      const std::string document = R"({"KOVAMDTextContent":"a lantern","KOVAMDFSContentChangeDate":)" + date + "}";
      const std::string path = "/v/" + id + std::to_string(i);
      Send("document_upsert_by_id", R"({"id":")" + id + R"(","doc_id":")" + path + R"(","data":)" + document + "}");
    }
    ASSERT_EQ(Commit(id), 0);
  }
  const Json::Value data = Send(
      "search", R"({"query":"lantern","sort":"date","offset":3,"limit":3,"mark_start":"<","mark_end":">"})")["data"];
  EXPECT_EQ(data["total"].asInt(), 10);
  std::string hits;
  for (const Json::Value& hit : data["hits"]) hits += hit["id"].asString() + ":" + hit["doc_id"].asString() + " ";
  EXPECT_EQ(hits, "a:/v/a3 b:/v/b2 a:/v/a2 ");
  EXPECT_EQ(data["hits"][0]["snippet"].asString(), "a <lantern>");
  EXPECT_FALSE(data["hits"][0]["fields"].isMember("KOVAMDTextContent"));
  EXPECT_EQ(Send("search", R"({"query":"lantern","ids":["b"],"snippet":false})")["data"]["total"].asInt(), 5);
}

// Texts of many lengths and ages under equal dates, sizes and names: the close score differs from the quick one, and
// the other orders have nothing but ties.
TEST_F(EngineTest, PagesOfAnySizeGiveOneSequenceWithEachHitOnce) {
  for (const std::string id : {"a", "b"}) {
    ASSERT_EQ(Create(id, id), 0);
    std::string parts;
    for (int i = 0; i < 1500; ++i) {
      std::string text;
      for (int words = i * 7919 % 97; words >= 0; --words) text += words % 9 == 0 ? "lantern " : "other ";
      parts += std::string(i == 0 ? "" : ",") + R"({"command":"document_upsert_by_id","data":{"id":")" + id +
               R"(","doc_id":"/)" + id + std::to_string(i) + R"(/n","data":{"KOVAMDTextContent":")" + text + "\"}}}";
    }
    ASSERT_FALSE(SendText("{\"compound\":[" + parts + "]}")["has_fail"].asBool());
    ASSERT_EQ(Commit(id), 0);
  }
  const auto paged = [this](const std::string& rest, int total, int limit) {
    std::vector<std::string> sequence;
    for (int offset = 0; offset < total; offset += limit) {
      const std::string page = R"(,"offset":)" + std::to_string(offset) + R"(,"limit":)" + std::to_string(limit);
      const Json::Value reply = Send("search", R"({"query":"lantern","snippet":false,)" + rest + page + "}");
      for (const Json::Value& hit : reply["data"]["hits"]) sequence.push_back(hit["doc_id"].asString());
    }
    return sequence;
  };
  for (const std::string sort : {"relevance", "date", "size", "name"}) {
    for (const std::string order : {"asc", "desc"}) {
      for (const std::string ids : {R"(["a"])", R"(["a","b"])"}) {
        const std::string rest = R"("sort":")" + sort + R"(","order":")" + order + R"(","ids":)" + ids;
        SCOPED_TRACE(rest);
        const int total = ids.size() > 5 ? 3000 : 1500;
        const std::vector<std::string> sequence = paged(rest, total, 1000);
        EXPECT_EQ(std::set<std::string>(sequence.begin(), sequence.end()).size(), static_cast<size_t>(total));
        EXPECT_EQ(paged(rest, total, 170), sequence);
      }
    }
  }
}

}  // namespace
}  // namespace ferrox::engine
