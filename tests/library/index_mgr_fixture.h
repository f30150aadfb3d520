#pragma once

#include <unistd.h>

#include <map>
#include <memory>

#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/queue/event.h"
#include "sdk/share.h"
#include "tests/support/library_test.h"
#include "tests/support/unix_server.h"

namespace ferrox::fileindex {

namespace fs = std::filesystem;

/// The management operations on the shares /volume1/{photo,photos,homes} and /volume10/music, real folders below the
/// test's root. What an operation does outside is written down in one text, in the order in which it happens.
class IndexMgrTest : public test::LibraryTest {
 protected:
  void SetUp() override {
    platform_.Reset();
    platform_.spotlight = 1;
    platform_.engine = [this](const std::string& request) { return Answer(test::Parse(request)); };
    engine_fails_.clear();
    daemon_runs_ = true;
    for (const char* name : {"photo", "photos", "homes"}) AddShare(name, "/volume1/");
    AddShare("music", "/volume10/");
    for (const std::string& file : {folders_, folders_ + ".new", status_}) (void)fs::remove_all(file);
    test::WriteFile(InstancePath(kElasticdSocket), "");
  }
  void AddShare(const std::string& name, const std::string& volume) {
    platform_.shares[name] = {test::TestRoot() + volume + name};
    (void)fs::remove_all(platform_.shares[name].path);
    fs::create_directories(platform_.shares[name].path + "/a/b");
    queues_[name] = sdk::SDKShare(name).GetQueuePath();
    (void)fs::remove(queues_[name]);
    short_.insert(short_.begin(), {{queues_[name], name}, {sdk::SDKShare(name).GetDBPath(), name + ".index"}});
  }

  static Json::Value List(const std::vector<Json::Value>& elements) {
    Json::Value list(Json::arrayValue);
    for (const Json::Value& element : elements) list.append(element);
    return list;
  }
  /// The stored form of folders "<path>[ <kinds>]; ", the kinds by their first letters, "dp" when none are given.
  static Json::Value Folders(const std::string& text) {
    Json::Value list(Json::arrayValue);
    for (size_t at = 0, end = 0; at < text.size(); at = end + 2) {
      end = std::min(text.find(';', at), text.size());
      const size_t blank = std::min(text.find(' ', at), end);
      const std::string kinds = blank < end ? text.substr(blank, end - blank) : "dp";
      const auto has = [&kinds](char kind) { return kinds.find(kind) != std::string::npos; };
      list.append(Folder(text.substr(at, blank - at), "n", has('d'), has('a'), has('v'), has('p'), 0, 0).GetData());
    }
    return list;
  }
  void Store(const std::string& folders) { ASSERT_TRUE(toFile(Folders(folders), folders_)); }
  /// The stored folders, each as "<path> <kinds>[ paused][ <volume>]; ".
  std::string Stored() const {
    const FolderMgr mgr;
    std::string text;
    for (const auto& folder : mgr.GetFolders()) {
      text += folder->GetPath() + " " + Kinds(folder->GetIndexCfg()) + (folder->IsPaused() ? " paused" : "");
      text += (folder->GetVolumeToBeClean().empty() ? "" : " " + Short(folder->GetVolumeToBeClean())) + "; ";
    }
    return text;
  }

  /// How the call fails, with a daemon that answers.
  std::string Failure(const std::function<void()>& call) {
    const auto serve = [this](int fd) { Serve(fd); };
    std::unique_ptr<test::UnixServer> daemon;
    if (daemon_runs_) daemon = std::make_unique<test::UnixServer>(InstancePath(kFileIndexdSocket), serve, 100);
    return test::FailureOf(call);
  }
  /// What the operation does, each step followed by "; ", and at the end what it throws.
  template <typename Operation, typename... Arguments>
  std::string Does(const Operation& operation, const Arguments&... arguments) {
    NoticeFiles();
    done_.clear();
    platform_.on_call = [this](const std::string& call) { OnCall(call); };
    const std::string failure = Failure([&] { operation(arguments...); });
    platform_.on_call = nullptr;
    NoticeFiles();
    return done_ + (failure.empty() ? "" : "throws " + Short(failure));
  }

  const std::string folders_ = InstancePath(kFileIndexFoldersCfgPath), status_ = InstancePath(kFileIndexStatusCfgPath);
  std::map<std::string, std::string> queues_;  // by share
  std::map<std::string, int> engine_fails_;    // commands, and the code with which they fail
  bool daemon_runs_ = true;

 private:
  static std::string Kinds(const Json::Value& config) {
    std::string kinds;
    for (const std::string kind : {"document", "audio", "video", "photo"})
      kinds += kind.substr(0, config[kind].asBool());
    return kinds;
  }
  std::string Short(std::string text) const {
    for (const auto& [from, to] : short_) {
      for (size_t at = text.find(from); at != std::string::npos; at = text.find(from))
        text.replace(at, from.size(), to);
    }
    return text;
  }

  void Note(const std::string& what) {
    NoticeFiles();
    done_ += Short(what) + "; ";
  }
  /// What was appended to the file, or all of it when it was replaced; "" when it is as before.
  std::string News(const std::string& path) {
    const std::string now = test::ReadFile(path), before = std::exchange(contents_[path], now);
    return now == before ? "" : now.rfind(before, 0) == 0 ? now.substr(before.size()) : now;
  }
  void NoticeFiles() {
    if (!News(folders_).empty()) done_ += "saved; ";
    if (!News(status_).empty()) done_ += "status " + Short(toString(test::Parse(contents_[status_])["share"])) + "; ";
    for (const auto& [share, queue] : queues_) {
      std::istringstream added(News(queue));
      for (std::string line; std::getline(added, line);) NoticeEvent("queue " + share, Event(line));
    }
  }
  void NoticeEvent(const std::string& queue, const Event& event) {
    done_ += queue + (event.event == EVENT_REINDEX  ? ": reindex "
                      : event.event == EVENT_RENAME ? ": rename "
                                                    : ": kinds ");
    done_ += Short(event.path_old) + (event.path_old.empty() ? "" : " -> ") + Short(event.path);
    done_ += (event.data.isNull() ? "" : " [" + Kinds(event.data) + "]") + "; ";
  }
  void OnCall(const std::string& call) {
    NoticeFiles();
    for (const char* prefix : {"MonitorQueue::", "KLIBService", "KOVASMBSet", "KLIBCExec("}) {
      if (call.rfind(prefix, 0) == 0) Note(call);
    }
  }
  std::string Answer(const Json::Value& request) {
    const std::string command = request.get("command", "compound").asString();
    const Json::Value changes = command == "index_config_set" ? request["data"]["data"] : Json::Value("");
    Note(command + " " + request["data"]["id"].asString() + " " + toString(changes));
    if (engine_fails_.count(command) == 0) return R"({"success":true,"data":[{"KOVAMDPath":"/doc"}]})";
    return R"({"success":false,"error":{"msg":"m","code":)" + std::to_string(engine_fails_[command]) + "}}";
  }
  void Serve(int fd) {
    std::string text(1000, '\0');
    EXPECT_EQ(read(fd, text.data(), 4), 4);
    EXPECT_GT(read(fd, text.data(), text.size()), 0);
    const Json::Value command = test::Parse(text.c_str());
    Note(command["type"].asString() + " " + toString(command["data"]));
    EXPECT_EQ(write(fd, "\0\0\0\0", 4), 4);
  }

  std::string done_;
  std::map<std::string, std::string> contents_;
  /// What Short replaces: the paths of shares, which stand before these, calls by their sense, JSON's punctuation.
  std::vector<std::pair<std::string, std::string>> short_ = {{test::TestRoot(), ""},
                                                             {"MonitorQueue::Upsert(", "watch("},
                                                             {"MonitorQueue::Delete(", "unwatch("},
                                                             {", fileindex, 1)", ")"},
                                                             {"KLIBCExec(/bin/rm -rf ", "rm("},
                                                             {" \"\"", ""},
                                                             {"\"", ""},
                                                             {"{", ""},
                                                             {"}", ""}};
};

}  // namespace ferrox::fileindex
