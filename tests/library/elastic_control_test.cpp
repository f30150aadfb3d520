// Catches requests to the engine and a schema that differ from what both sides agreed to.
#include "fileindex/elastic/elastic_control.h"

#include <map>
#include <set>
#include <stdexcept>

#include "fileindex/status_mgr.h"
#include "tests/support/library_test.h"
#include "wire/fields.h"

namespace ferrox::fileindex::elastic {

namespace {

using test::FailureOf;
using test::Parse;

class ElasticControlTest : public test::LibraryTest {
 protected:
  void SetUp() override {
    platform_.shares["photo"] = {"/volume1/photo"};
    platform_.engine = [this](const std::string& request) {
      const Json::Value command = Parse(request)["command"];
      return command == "document_get_by_query" ? below_ : std::string(R"({"success":true})");
    };
    test::WriteFile(InstancePath(kElasticdSocket), "");
    (void)std::filesystem::remove(InstancePath(kFileIndexStatusCfgPath));
  }
  /// The requests that the call sends, one a line.
  std::string SentBy(const std::function<void()>& call) {
    std::string lines;
    platform_.sent.clear();
    call();
    for (const std::string& request : platform_.sent) lines += request + "\n";
    return lines;
  }

  std::string below_ = R"({"success":true,"data":[]})";
};

}  // namespace

TEST(SchemaTest, HasEveryFieldAndAttribute) {
  EXPECT_EQ(toString(GetFileIndexSettings()), "{}");
  EXPECT_EQ(toString(GetFileIndexEventHandler()),
            R"({"lib_path":"/var/packages/Ferrox/target/handler/fileindex_event_handler.so"})");
  const Json::Value mappings = GetFileIndexMappings();
  EXPECT_EQ(mappings.size(), 3U);
  EXPECT_EQ(mappings["property_id"], "KOVAMDPath");
  EXPECT_EQ(toString(mappings["default"]),
            R"({"_all":true,"analyzer":"kovastandard","required":false,"stored":true,"type":"string"})");
  const Json::Value& properties = mappings["properties"];
  EXPECT_EQ(properties.size(), 53U);
  std::map<std::string, int> types, analyzers;
  for (const Json::Value& property : properties) {
    ++types[property.get("type", "").asString()];
    ++analyzers[property.get("analyzer", "").asString()];
  }
  EXPECT_EQ(types, (std::map<std::string, int>{{"", 13}, {"bool", 1}, {"double", 1}, {"int", 22}, {"text", 16}}));
  EXPECT_EQ(analyzers, (std::map<std::string, int>{{"", 32}, {"keyword", 13}, {"white space", 8}}));
  EXPECT_EQ(toString(properties["KOVAMDPath"]), R"({"_all":false,"analyzer":"keyword","required":true})");
  EXPECT_EQ(toString(properties["KOVAMDSearchFileName"]),
            R"({"analyzer":"white space","preprocess":["tolower","ngram"],"type":"text"})");
}

TEST(FieldsTest, AreOneHundredAndThirtyDifferentNames) {
  const std::set<std::string> names(std::begin(kFieldNames), std::end(kFieldNames));
  EXPECT_EQ(std::size(kFieldNames), 130U);
  EXPECT_EQ(names.size(), 130U);
  for (const char* odd : {"KOVAMDContactKeyworlds", "KOVAMDRecodingDate", "KOVAStateOrProvince"}) {
    EXPECT_EQ(names.count(odd), 1U) << odd;
  }
}

TEST_F(ElasticControlTest, CommandsAndTheirRequests) {
  std::vector<std::string> paths;
  EXPECT_EQ(SentBy([] { IndexDel("photo", "/v/p/\xff\n"); }),
            "{\"command\":\"document_del_by_id\",\"data\":{\"doc_id\":\"/v/p/\xff\\n\",\"id\":\"fileindex_photo\"}}\n");
  EXPECT_EQ(SentBy([] { IndexDelDir("photo", "/v/a"); }),
            R"({"command":"document_del_by_query","data":{"id":"fileindex_photo",)"
            R"("query":{"qsl":{"prefix":{"KOVAMDPath":"/v/a/"}}}}})"
            "\n");
  EXPECT_EQ(SentBy([&paths] { IndexGetByPrefixPath("any id", "/v/a", paths); }),
            R"({"command":"document_get_by_query","data":{"id":"any id","query":{"load_field":["KOVAMDPath"],)"
            R"("qsl":{"prefix":{"KOVAMDPath":"/v/a/"}}}}})"
            "\n");
  EXPECT_EQ(SentBy([] { IndexCommit("photo"); }), "{\"command\":\"commit\",\"data\":{\"id\":\"fileindex_photo\"}}\n");
  const Json::Value create = Parse(SentBy([] { ShareIndexCreate("photo"); }));
  EXPECT_EQ(create["command"], "index_create");
  EXPECT_EQ(create["data"].getMemberNames(),
            (Json::Value::Members{"event_handler", "id", "mappings", "path", "settings"}));
  EXPECT_EQ(create["data"]["mappings"], GetFileIndexMappings());
  EXPECT_EQ(FailureOf([] { ShareIndexCreate("nope"); }), "800 nope");
}

TEST_F(ElasticControlTest, DocumentsAreBuiltByTheExtractor) {
  EXPECT_EQ(SentBy([] { IndexUpsert("photo", "/v/p/a.jpg", true); }),
            R"({"command":"document_upsert_by_id","data":{"data":{"KOVAMDFSName":"a.jpg","KOVAMDIsDir":false,)"
            R"("KOVAMDParent":"/v/p","KOVAMDPath":"/v/p/a.jpg","KOVAMDSearchFileName":"a.jpg"},)"
            R"("doc_id":"/v/p/a.jpg","id":"fileindex_photo"}})"
            "\n");
  EXPECT_NE(SentBy([] { IndexAttr("photo", "/v/p/a.jpg"); }).find(R"("command":"document_set_by_id")"),
            std::string::npos);
  ASSERT_EQ(platform_.parsed.size(), 2U);
  EXPECT_EQ(toString(platform_.parsed[0].second), R"({"need_meta":true})");
  EXPECT_EQ(toString(platform_.parsed[1].second), R"({"need_meta":false})");
  for (const int way : {0, 1, 2}) {
    platform_.parse_file = [way](const std::string&, const Json::Value&, Json::Value& document) {
      if (way == 0) throw std::runtime_error("gone");
      if (way == 1) throw 7;
      document = "no object";
    };
    EXPECT_EQ(FailureOf([] { IndexUpsert("photo", "/v/p/a", true); }), "914 Parse failed, path=/v/p/a");
  }
}

TEST_F(ElasticControlTest, RenameMovesTheFolderAndAllBelow) {
  below_ = R"({"success":true,"data":[
      {"KOVAMDPath":"/v/p/old/a.JPG","KOVAMDFSName":"a.JPG","KOVAMDParent":"/v/p/old"},
      {"KOVAMDPath":"/v/p/old/d/b","KOVAMDFSName":"b","KOVAMDParent":"/v/p/old/d"},
      {"KOVAMDFSName":"n","KOVAMDParent":"/w/q/new"}]})";
  const std::string set = R"({"command":"document_set_by_id","data":{"data":{)";
  const auto part = [&set](const std::string& parent, const std::string& name, const std::string& id) {
    return set + R"("KOVAMDParent":")" + parent + R"(","KOVAMDPath":")" + parent + "/" + name +
           R"(","KOVAMDSearchFileName":")" + name + R"("},"doc_id":)" + id + R"(,"id":"fileindex_photo"}})";
  };
  EXPECT_EQ(SentBy([] { IndexRename("photo", "/v/p/New.Dir", "/v/p/old"); }),
            set +
                R"("KOVAMDDisplayName":"New.Dir","KOVAMDExtension":"dir","KOVAMDFSName":"New.Dir",)"
                R"("KOVAMDKind":"dir","KOVAMDParent":"/v/p","KOVAMDPath":"/v/p/New.Dir",)"
                R"("KOVAMDSearchFileName":"New.Dir"},"doc_id":"/v/p/old","id":"fileindex_photo"}})"
                "\n"
                R"({"command":"document_get_by_query","data":{"id":"fileindex_photo","query":{)"
                R"("load_field":["KOVAMDPath","KOVAMDFSName","KOVAMDParent"],)"
                R"("qsl":{"prefix":{"KOVAMDPath":"/v/p/old/"}}}}})"
                "\n"
                R"({"compound":[)" +
                part("/v/p/New.Dir", "a.JPG", R"("/v/p/old/a.JPG")") + "," +
                part("/v/p/New.Dir/d", "b", R"("/v/p/old/d/b")") + "," + part("/v/p/New.Dir", "n", "null") + "]}\n");
  below_ = R"({"success":true,"data":null})";
  EXPECT_NE(SentBy([] { IndexRename("photo", "/n", "/o"); }).find("{\"compound\":[]}\n"), std::string::npos);
}

TEST_F(ElasticControlTest, UnusableLists) {
  const auto rename = [] { IndexRename("photo", "/n", "/o"); };
  std::vector<std::string> paths = {"kept"};
  const auto list = [&paths] { IndexGetByPrefixPath("id", "/o", paths); };
  for (const char* reply : {R"({"success":true})", R"({"data":{},"success":true})", R"({"data":5,"success":true})"}) {
    below_ = reply;
    EXPECT_EQ(FailureOf(rename), std::string("916 ") + reply);
    EXPECT_EQ(FailureOf(list), std::string("916 ") + reply);
  }
  for (const char* entry : {"5", "[]", "\"x\""}) {
    below_ = std::string(R"({"success":true,"data":[)") + entry + "]}";
    EXPECT_EQ(FailureOf(rename).rfind("120 Not an object", 0), 0U) << entry;
    EXPECT_EQ(FailureOf(list).rfind("913 Recv failed, res=", 0), 0U) << entry;
  }
  below_ = R"({"success":true,"data":[{"KOVAMDFSName":"n"}]})";
  EXPECT_EQ(FailureOf(rename).rfind("120 Missing property: KOVAMDParent", 0), 0U);
  below_ = R"({"success":true,"data":[{"KOVAMDPath":"/o/b"},{},{"KOVAMDPath":"/o/a"},null]})";
  EXPECT_EQ(FailureOf(list), "");
  EXPECT_EQ(paths, (std::vector<std::string>{"kept", "/o/b", "/o/a"}));
}

TEST_F(ElasticControlTest, CommitTellsAFullVolumeFromOtherFailures) {
  platform_.engine = [](const std::string&) { return R"({"success":false,"error":{"code":1407,"msg":"disk"}})"; };
  const auto commit = [] { IndexCommit("photo"); };
  EXPECT_EQ(FailureOf(commit), "1407 Request failed, msg=disk");
  EXPECT_EQ(StatusMgr().GetShareStatus("photo"), 0);
  platform_.failing["KOVAQuotaIsEnough"] = {KOVA_ERR_OUT_OF_SPACE};
  EXPECT_EQ(FailureOf(commit), "1003 Share (photo) space not enough");
  EXPECT_EQ(StatusMgr().GetShareStatus("photo"), StatusMgr::kNeedReindex);
}

}  // namespace ferrox::fileindex::elastic
