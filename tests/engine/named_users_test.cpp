// Catches answers to programs that ask for a user whom they may not ask for, or of a share whose rules keep that user
// out; and a name service without an answer that holds more than two threads.
#include <atomic>
#include <chrono>
#include <future>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "base/name_rules.h"
#include "services/kovaelasticd/commands/share_rules.h"
#include "tests/engine/engine_fixture.h"
#include "wire/engine_requests.h"

namespace ferrox::engine {
namespace {

constexpr uid_t kClient = 33;

TEST(ShareRulesTest, WhoIsLetIn) {
  const NamedUser user{
      2000,
      {2000},
      std::make_shared<const std::vector<std::string>>(std::vector<std::string>{"@lost", "ann", "bob"}),
      {Meant::kUnknown, Meant::kYes, Meant::kNo}};
  const struct {
    const char* rules;
    bool in;
  } cases[] = {{R"({"valid_users":[],"invalid_users":[]})", true},
               {R"({"valid_users":["bob","ann"],"invalid_users":["bob"]})", true},
               {R"({"valid_users":["@lost","ann"],"invalid_users":[]})", true},
               {R"({"valid_users":["bob"],"invalid_users":[]})", false},
               {R"({"valid_users":["@lost"],"invalid_users":[]})", false},
               {R"({"valid_users":["never asked for"],"invalid_users":[]})", false},
               {R"({"valid_users":["ann"],"invalid_users":["ann"]})", false},
               {R"({"valid_users":["ann"],"invalid_users":["@lost"]})", false},
               {R"({"valid_users":[],"invalid_users":["never asked for"]})", false},
               {R"({"valid_users":[],"invalid_users":[],"closed":""})", false},
               {R"({"valid_users":"ann","invalid_users":[]})", false},
               {R"({"valid_users":[7],"invalid_users":[]})", false},
               {R"({"valid_users":[]})", false},
               {"{}", false},
               {"null", false}};
  for (const auto& one : cases) {
    Json::Value rules;
    ASSERT_TRUE(fromString(rules, one.rules));
    EXPECT_EQ(RulesLetIn(rules, user), one.in) << one.rules;
  }
}

/// An engine with a name service of the test's own, which knows ann (2000).
class NamedUsersTest : public EngineTest {
 protected:
  NamedUsersTest() { RestartHere(); }
  void RestartHere() {
    engine_.reset();
    const LookFunction look = [](const Asker& asker, const std::vector<std::string>& paths) {
      EXPECT_EQ(asker.uid, 2000U);
      EXPECT_EQ(asker.groups, (std::vector<uint32_t>{5, 2000}));
      std::vector<wire::LiveFile> files;
      for (const std::string& path : paths) {
        const bool folder = path == asker.share_root || path.ends_with("/d") || path.ends_with("/secret1");
        files.push_back({true, folder, true, "5.1.2.77"});
      }
      return files;
    };
    const UserSources users{[this] { return trust_; }, [this](const auto& arguments) { return LookUp(arguments); }};
    engine_ = std::make_unique<Engine>(folder_ / "state", look, users);
  }
  std::optional<std::string> LookUp(const std::vector<std::string>& arguments) {
    ++look_ups_;
    if (arguments[1].starts_with("slow")) go_on_future_.wait();
    if (arguments[1] != "ann") return answer_;
    std::string rules;
    for (size_t i = 2; i < arguments.size(); ++i) {
      rules += (i == 2 ? "" : ",") + std::string(arguments[i] == "ann" ? "\"yes\"" : "\"no\"");
    }
    return R"({"uid":2000,"gids":[2000,5,5],"may_log_in":true,"rules":[)" + rules + "]}";
  }
  void PutShare(const std::string& name, const char* rules) {
    ASSERT_EQ(Create(name, name), 0);
    Json::Value read;
    ASSERT_TRUE(fromString(read, rules));
    for (const char* list : {"veto_files", "hide_files"}) read[list] = Json::arrayValue;
    Note(name, read);
  }
  void Note(const std::string& name, const Json::Value& rules) {
    ASSERT_EQ(CodeOf(SendText(toString(wire::IndexShareRequest(name, {name, "/v/" + name, "", rules})))), 0);
  }
  Json::Value Ask(const std::string& as, const std::string& command = "shares", uid_t uid = kClient) {
    Json::Value reply;
    const std::string text = R"({"command":")" + command + R"(","data":{"query":"a","path":"/v/a","as":)" + as + "}}";
    EXPECT_TRUE(fromString(reply, engine_->Handle(text, {uid, 33, 1, {}})));
    return reply;
  }

  /// Notes which names of the share "all" are vetoed and hidden.
  void NoteNames(const char* lists) {
    Json::Value rules;
    ASSERT_TRUE(fromString(rules, std::string(R"({"valid_users":[],"invalid_users":[],)") + lists + "}"));
    Note("all", rules);
  }
  void PutFile(const std::string& path, bool is_folder = false) {
    Json::Value document;
    document["KOVAMDTextContent"] = "common";
    document["KOVAMDIsDir"] = is_folder;
    document["_KOVAStamp"] = "5.1.2.77";
    document["_KOVAAccess"] = is_folder ? "0:0:0755" : "0:0:0644";
    EXPECT_EQ(CodeOf(SendText(toString(wire::UpsertDocumentRequest("all", path, document)))), 0);
  }
  /// The names of the files that a search finds; with `patient`, once it is not refused with 1412.
  std::string Found(const std::string& as, bool patient = true, uid_t uid = kClient) {
    const std::string text =
        R"({"command":"search","data":{"query":"common","shares":["all"],"sort":"name","order":"asc","as":)" + as +
        "}}";
    for (;; std::this_thread::sleep_for(std::chrono::milliseconds(1))) {
      Json::Value reply;
      EXPECT_TRUE(fromString(reply, engine_->Handle(text, {uid, 33, 1, {}})));
      const int code = CodeOf(reply);
      if (code == 1412 && patient) continue;
      std::string names = code == 0 ? "" : std::to_string(code);
      for (const Json::Value& hit : reply["data"]["hits"]) {
        const std::string path = hit["doc_id"].asString();
        names += (names.empty() ? "" : " ") + path.substr(path.rfind('/') + 1);
      }
      EXPECT_TRUE(code != 0 || reply["data"]["total"].asUInt() == reply["data"]["hits"].size());
      return names;
    }
  }
  int Shown(const std::string& path) {
    Json::Value reply;
    EXPECT_TRUE(
        fromString(reply, engine_->Handle(R"({"command":"show","data":{"path":")" + path + R"(","as":{"user":"ann"}}})",
                                          {kClient, 33, 1, {}})));
    return CodeOf(reply);
  }

  Trust trust_{{kClient}, 1000, {4000}};
  std::optional<std::string> answer_;
  std::promise<void> go_on_;
  const std::shared_future<void> go_on_future_ = go_on_.get_future().share();
  std::atomic<int> look_ups_ = 0;
};

TEST_F(NamedUsersTest, TrustedClientsAskForUsersWhomTheRulesLetIn) {
  PutShare("all", R"({"valid_users":[],"invalid_users":["nobody"]})");
  PutShare("hers", R"({"valid_users":["ann"],"invalid_users":[]})");
  PutShare("his", R"({"valid_users":["bob"],"invalid_users":[]})");
  const std::string ann = R"({"user":"ann"})";
  const Json::Value shares = Ask(ann)["data"];
  ASSERT_EQ(shares.size(), 2U);
  EXPECT_EQ(shares[0]["share"].asString() + shares[1]["share"].asString(), "allhers");
  EXPECT_EQ(CodeOf(Ask(ann, "search")), 0);
  EXPECT_EQ(CodeOf(Ask(ann, "show")), 1405);
  EXPECT_EQ(Ask(ann, "shares", 0), Ask(ann));
  EXPECT_EQ(look_ups_, 1);
  PutShare("new", R"({"valid_users":["ann","eve"],"invalid_users":[]})");
  EXPECT_EQ(Ask(ann)["data"].size(), 3U);
  EXPECT_EQ(look_ups_, 2);
  // Nobody else, no other command, no other "as".
  EXPECT_EQ(CodeOf(Ask(ann, "shares", 34)), 1406);
  EXPECT_EQ(CodeOf(Ask(ann, "commit")), 1406);
  EXPECT_EQ(CodeOf(Ask(R"({"uid":2000,"groups":[5,2000]})")), 1406);
  EXPECT_EQ(CodeOf(Ask(R"({"user":"ann","groups":[0]})")), 1403);
  trust_.clients.clear();
  EXPECT_EQ(CodeOf(Ask(ann)), 1406);
}

TEST(NameRulesTest, PatternsAndNames) {
  const struct {
    const char *pattern, *name;
    bool matches, with_case;
  } cases[] = {{"secret", "Secret", true, false},
               {"secret", "secret2", false, false},
               {"*.tmp", "a.b.TMP", true, false},
               {"*.tmp", ".tmp", true, true},
               {"*.tmp", "a.tmp2", false, false},
               {".*", ".x", true, true},
               {".*", "x.", false, false},
               {"*.*", "plain", false, false},
               {"?a?", "bab", true, true},
               {"?a?", "ba", false, false},
               {"r?sum\u00E9*", "R\u00C9SUM\u00C9.txt", true, false},
               {"r\u00E9", "re", false, false},
               {"?.x", "\xE9.x", true, true},
               {"??.x", "\u00E9.x", false, false},
               {"*a*b*c*", "xxaxxbxxbxxc", true, true},
               {"*a*b*c*", "xxaxxcxxb", false, false},
               {"[a]", "a", false, false}};
  for (const auto& one : cases) {
    for (const bool counts : {false, true}) {
      const base::NameRules rules(base::NameRules::TextOf({"never", one.pattern}, counts));
      EXPECT_EQ(rules.Match(one.name), counts ? one.with_case : one.matches) << one.pattern << ' ' << one.name;
      EXPECT_EQ(rules.MatchAnyIn(std::string("a/") + one.name + "/b"), rules.Match(one.name)) << one.pattern;
    }
  }
  std::string stars;
  for (int i = 0; i < 100; ++i) stars += "*a";
  EXPECT_FALSE(base::NameRules(base::NameRules::TextOf({stars}, true)).Match(std::string(254, 'a') + "b"));
}

TEST_F(NamedUsersTest, WhatTheShareDoesNotShowIsNotFoundByName) {
  const std::string ann = R"({"user":"ann"})", local = R"({"uid":2000,"groups":[5,2000]})";
  PutShare("all", R"({"valid_users":[],"invalid_users":[]})");
  PutFile("/v/all", true);
  PutFile("/v/all/d", true);
  for (const char* path : {"a.tmp", "b", "d/inner", "d/own.hid"}) PutFile(std::string("/v/all/") + path);
  ASSERT_EQ(Commit("all"), 0);
  const std::string all = "a.tmp all b d inner own.hid";
  EXPECT_EQ(Found(ann), all);
  const auto note_both = [this] { NoteNames(R"("veto_files":["*.TMP","secret?"],"hide_files":["*.hid"])"); };
  note_both();
  // Until the names are compared, nothing is answered; no answer has what is not shown.
  const std::string at_once = Found(ann, false);
  EXPECT_TRUE(at_once == "1412" || at_once == "all b d inner") << at_once;
  EXPECT_EQ(Found(ann), "all b d inner");
  EXPECT_EQ(Found(local, true, 0), all);
  EXPECT_EQ(Shown("/v/all/a.tmp"), 1405);
  EXPECT_EQ(Shown("/v/all/d/own.hid"), 0) << "hidden, not vetoed";
  PutFile("/v/all/new.tmp");
  const std::string move = R"({"id":"all","doc_id":"/v/all/d","data":{"KOVAMDPath":"/v/all/secret1"}})";
  ASSERT_EQ(Code("folder_move", move), 0);
  ASSERT_EQ(Commit("all"), 0);
  EXPECT_EQ(Found(ann), "all b");
  EXPECT_EQ(Shown("/v/all/secret1/inner"), 1405);
  RestartHere();
  EXPECT_EQ(Found(ann, false), "all b") << "the marks are kept";
  NoteNames(R"("veto_files":[],"hide_files":["secret1"],"case_counts":true)");
  EXPECT_EQ(Found(ann), "a.tmp all b new.tmp");
  NoteNames(R"("veto_files":[],"hide_files":[])");
  EXPECT_EQ(Found(ann), Found(local, true, 0));
  NoteNames(R"("veto_files":[])");
  EXPECT_EQ(Found(ann), "1404") << "rules that do not tell";
  NoteNames(R"("veto_files":["a/b"],"hide_files":[])");
  EXPECT_EQ(Found(ann), "1404");
}

TEST_F(NamedUsersTest, WhoMayNotBeAskedForAndWhoCannotBeLookedUp) {
  const struct {
    const char *name, *answer;
    int code;
  } cases[] = {{"root", R"({"uid":0,"gids":[0],"may_log_in":true,"rules":[]})", 1406},
               {"low", R"({"uid":999,"gids":[9],"may_log_in":true,"rules":[]})", 1406},
               {"nologin", R"({"uid":3000,"gids":[9],"may_log_in":false,"rules":[]})", 1406},
               {"ended", R"({"uid":4000,"gids":[9],"may_log_in":true,"rules":[]})", 1406},
               {"none", "{}", 1406},
               {"cut", R"({"uid":3000,"gids":[9],"may_)", 1414},
               {"shape", R"({"uid":3000,"gids":[],"may_log_in":true,"rules":[]})", 1414},
               {"rules", R"({"uid":3000,"gids":[9],"may_log_in":true,"rules":["yes"]})", 1414}};
  for (const auto& one : cases) {
    answer_ = one.answer;
    const Json::Value error = Ask(R"({"user":")" + std::string(one.name) + "\"}")["error"];
    EXPECT_EQ(error["code"], one.code) << one.name;
    if (one.code != 1406) continue;
    EXPECT_EQ(error["msg"], "\"" + std::string(one.name) + "\" may not search by way of another program");
  }
}

TEST_F(NamedUsersTest, ANameServiceWithoutAnAnswerHoldsTwoThreads) {
  answer_ = "{}";
  const std::string ann = R"({"user":"ann"})";
  EXPECT_EQ(CodeOf(Ask(ann)), 0);
  std::vector<std::future<int>> slow;
  for (const char* as : {R"({"user":"slow"})", R"({"user":"slower"})"}) {
    slow.push_back(std::async(std::launch::async, [this, as] { return CodeOf(Ask(as)); }));
  }
  while (look_ups_ < 3) std::this_thread::yield();
  EXPECT_EQ(CodeOf(Ask(R"({"user":"third"})")), 1414);
  EXPECT_EQ(CodeOf(Ask(ann)), 0) << "known";
  NamedUsers users({[this] { return trust_; }, [](const auto&) { return std::nullopt; }}, 0);
  {
    const NamedUsers::Turn one(users, 7), two(users, 7), other(users, 8);
    EXPECT_THROW(NamedUsers::Turn(users, 7), Error);
  }
  const NamedUsers::Turn again(users, 7);
  go_on_.set_value();
  for (std::future<int>& one : slow) EXPECT_EQ(one.get(), 1406);
}

}  // namespace
}  // namespace ferrox::engine
