#pragma once

#include <unistd.h>

#include <algorithm>
#include <map>
#include <memory>

#include "fileindex/folder_mgr.h"
#include "fileindex/index_mgr.h"
#include "fileindex/optree.h"
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
    names_.clear();
    for (const char* name : {"photo", "photos", "homes"}) AddShare(name, "/volume1/");
    AddShare("music", "/volume10/");
    for (const std::string& file : {folders_, folders_ + ".new", status_}) (void)fs::remove_all(file);
    test::WriteFile(InstancePath(kElasticdSocket), "");
  }

  void AddShare(const std::string& name, const std::string& volume) {
    platform_.shares[name] = {test::TestRoot() + volume + name};
    fs::create_directories(platform_.shares[name].path + "/a/b");
    queues_[name] = sdk::SDKShare(name).GetQueuePath();
    (void)fs::remove(queues_[name]);
    names_.insert(names_.begin(), {{queues_[name], name}, {sdk::SDKShare(name).GetDBPath(), name + ".index"}});
  }

  /// The stored form of a folder with the kinds named by their first letters.
  static Json::Value Entry(const std::string& path, const std::string& kinds = "dp") {
    const auto has = [&kinds](char kind) { return kinds.find(kind) != std::string::npos; };
    return Folder(path, "n", has('d'), has('a'), has('v'), has('p'), false, false).GetData();
  }
  static Json::Value List(const std::vector<Json::Value>& elements) {
    Json::Value list(Json::arrayValue);
    for (const Json::Value& element : elements) list.append(element);
    return list;
  }
  void Store(const std::vector<Json::Value>& folders) { ASSERT_TRUE(toFile(List(folders), folders_)); }
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
    const auto serve = [this](int fd) { ServeCommand(fd); };
    std::unique_ptr<test::UnixServer> daemon;
    if (daemon_runs_) daemon = std::make_unique<test::UnixServer>(InstancePath(kFileIndexdSocket), serve, 100);
    return test::FailureOf(call);
  }
  /// What the call does, each step followed by "; ", and at the end what it throws.
  std::string Effects(const std::function<void()>& call) {
    NoticeFiles();
    done_.clear();
    platform_.on_call = [this](const std::string& platform_call) { OnCall(platform_call); };
    const std::string failure = Failure(call);
    platform_.on_call = nullptr;
    NoticeFiles();
    return done_ + (failure.empty() ? "" : "throws " + Short(failure));
  }

  const std::string folders_ = InstancePath(kFileIndexFoldersCfgPath);
  const std::string status_ = InstancePath(kFileIndexStatusCfgPath);
  std::map<std::string, std::string> queues_;  // by share
  bool daemon_runs_ = true;
  /// Engine commands that fail, with this code.
  std::map<std::string, int> engine_fails_;

 private:
  static std::string Kinds(const Json::Value& config) {
    std::string kinds;
    for (const char* kind : {"document", "audio", "video", "photo"}) kinds += config[kind].asBool() ? kind[0] : '\0';
    kinds.erase(std::remove(kinds.begin(), kinds.end(), '\0'), kinds.end());
    return kinds;
  }

  /// `text` without the test's root, a share's name for its queue, and JSON without quotes and braces.
  std::string Short(std::string text) const {
    static const std::vector<std::pair<std::string, std::string>> kCalls = {{test::TestRoot(), ""},
                                                                            {"MonitorQueue::Upsert(", "watch("},
                                                                            {"MonitorQueue::Delete(", "unwatch("},
                                                                            {", fileindex, 1)", ")"},
                                                                            {"KLIBCExec(/bin/rm -rf ", "rm("},
                                                                            {"\"", ""},
                                                                            {"{", ""},
                                                                            {"}", ""}};
    for (const auto* table : {&names_, &kCalls}) {
      for (const auto& [from, to] : *table) {
        for (size_t at = text.find(from); at != std::string::npos; at = text.find(from))
          text.replace(at, from.size(), to);
      }
    }
    return text;
  }

  void Note(const std::string& what) {
    NoticeFiles();
    done_ += Short(what) + "; ";
  }
  bool HasChanged(const std::string& path) {
    const std::string content = test::ReadFile(path);
    return std::exchange(contents_[path], content) != content;
  }
  void NoticeFiles() {
    if (HasChanged(folders_)) done_ += "saved; ";
    if (HasChanged(status_)) done_ += "status " + Short(toString(test::Parse(contents_[status_])["share"])) + "; ";
    for (const auto& [share, queue] : queues_) {
      const size_t before = contents_[queue].size();
      if (!HasChanged(queue) || contents_[queue].size() <= before) continue;
      std::istringstream added(contents_[queue].substr(before));
      for (std::string line; std::getline(added, line);) NoticeEvent(share, Event(line));
    }
  }
  void NoticeEvent(const std::string& share, const Event& event) {
    static const std::map<uint32_t, std::string> kNames = {
        {EVENT_RENAME, "rename "}, {EVENT_REINDEX, "reindex "}, {EVENT_UPDATE_CFG, "kinds "}};
    done_ += "queue " + share + ": " + kNames.at(event.event) + Short(event.path_old);
    done_ += (event.path_old.empty() ? "" : " -> ") + Short(event.path);
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
    const Json::Value changes = command == "index_config_set" ? request["data"]["data"] : Json::Value();
    Note(command + " " + request["data"]["id"].asString() + (changes.isNull() ? "" : " " + toString(changes)));
    const auto failing = engine_fails_.find(command);
    if (failing == engine_fails_.end()) return R"({"success":true,"data":[{"KOVAMDPath":"/doc"}]})";
    return R"({"success":false,"error":{"msg":"m","code":)" + std::to_string(failing->second) + "}}";
  }
  void ServeCommand(int fd) {
    uint32_t size = 0;
    std::string text(1000, '\0');
    EXPECT_EQ(read(fd, &size, sizeof(size)), 4);
    EXPECT_EQ(read(fd, text.data(), text.size()), static_cast<ssize_t>(size));
    const Json::Value command = test::Parse(text.c_str());
    Note(command["type"].asString() + " " + toString(command["data"]));
    EXPECT_EQ(write(fd, "\0\0\0\0", 4), 4);
  }

  std::string done_;
  std::map<std::string, std::string> contents_;
  std::vector<std::pair<std::string, std::string>> names_;
};

}  // namespace ferrox::fileindex
