#pragma once

#include <sys/types.h>

#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include <json/value.h>

#include <kova/error.h>
#include <kova/fs.h>
#include <kova/recycle.h>
#include <kova/share.h>

namespace ferrox::test {

struct FakeShare {
  std::string path;
  uint32_t ftp_privilege = 2;
  /// What the flag queries answer; SDKShare takes only 1 as yes.
  int recycle = 0, encryption = 0, encrypted = 0, read_only = 0, hide_unreadable = 0;
  /// KOVAShareUserPrivGet by user; KOVA_PRIV_READ_WRITE for those not named.
  std::map<std::string, int> privileges = {};
};

struct FakeUser {
  uint32_t uid = 0, gid = 0;
  bool admin = false;
  std::string home;
  int home_service = 0;
};

/// How calls of one function fail: with `code` for KLIBCErrGet, after `skip` that succeed, `times` times (-1: for
/// ever).
struct FakeFailure {
  int code = KOVA_ERR_SYSTEM;
  int skip = 0;
  int times = -1;
};

/// One connection of the engine's socket class: fails at `fault`, else receives one message and is sent `reply`.
struct FakeConnection {
  enum Fault { kNone, kConnect, kSend, kRecv };
  std::string reply;
  Fault fault = kNone;
};

struct FakeProgram {
  std::string path;
  unsigned options = 0;
  std::vector<std::string> arguments;
};

/// The platform as tests want it: plain data that the platform's functions answer from, and a record of what was
/// called. Nothing of it is locked but `calls`: set it up before threads start. Files are touched only by
/// KOVAFileCopy and KOVAACLPermGet (on the real ones) and by the FILEIDX calls, which make their folders below
/// FERROX_ROOT.
struct FakePlatform {
  static FakePlatform& Get();
  /// Back to the start: no shares, the users "root" and the one who runs the test, nothing fails. Call in SetUp.
  void Reset();

  std::map<std::string, FakeShare> shares;
  std::map<std::string, FakeUser> users;
  /// By the name of the platform function, for example "KOVAShareGet".
  std::map<std::string, FakeFailure> failing;

  /// KOVAQuotaIsEnough; `failing` it makes it answer 0 with a code.
  int quota_enough = 1;
  /// Type codes by path prefix (whole components), the longest wins; KOVA_FS_EXT elsewhere.
  std::map<std::string, int> fs_types;
  std::set<std::string> mount_points;
  /// Path prefixes (whole components).
  std::set<std::string> snapshots, recycle_bins, home_recycle_bins;
  /// What the enumerations of home recycle bins return, in this order: full path and where the account comes from (0: a
  /// folder without one).
  std::map<std::string, AUTH_TYPE> home_recycle_paths;
  /// KOVAACLPermGet by path; what access(2) says for others.
  std::map<std::string, int> permissions;

  /// Names of running services; starting and stopping changes it.
  std::set<std::string> running_services;
  /// KOVASMBIsEnableSpotlight; KOVASMBSetSpotlight changes it.
  int spotlight = 0;
  /// The documents registered by MonitorQueue, by application, type and queue path. `failing` and `calls` name the
  /// functions "MonitorQueue::Upsert" and "MonitorQueue::Delete".
  std::map<std::tuple<std::string, int, std::string>, Json::Value> monitor_queues;
  /// What FILEIDXDBPathCompose gives out, when set.
  std::optional<std::string> composed_db_path;
  /// Programs run by KLIBCExec and KLIBCExecl (none really runs), and their exit status.
  std::vector<FakeProgram> executed;
  int exec_status = 0;

  /// What ParseFile does; when empty it fills KOVAMDPath, KOVAMDParent, KOVAMDFSName and KOVAMDIsDir false. May throw.
  std::function<void(const std::string& path, const Json::Value& config, Json::Value& document)> parse_file;
  std::vector<std::pair<std::string, Json::Value>> parsed;
  /// What ExtractionProblem returns.
  std::string extraction_problem;

  /// Connections, one used up by each Connect. When none is left, `engine` answers each message; when it is empty too,
  /// the connection is a real one to the Unix socket. What scripted connections were sent is kept in `sent`.
  std::deque<FakeConnection> connections;
  std::function<std::string(const std::string& request)> engine;
  std::vector<std::string> sent;
  std::vector<std::string> connected_paths;

  /// The effective ids that geteuid and getegid report in the test program: the real ones until the first switch by
  /// ResetCredentialsByName or until set here. The process itself never changes.
  uid_t euid = 0;
  gid_t egid = 0;
  /// The names that ResetCredentialsByName switched to, in order.
  std::vector<std::string> switches;

  /// Every platform call in order: "KOVAShareGet(photo)", failing ones too.
  std::vector<std::string> calls;
  /// Told of each call before it is carried out, when set.
  std::function<void(const std::string& call)> on_call;
  bool Called(const std::string& call) const;
  /// How many calls there were of the named function.
  int CallCount(const std::string& function) const;
};

/// Records the call and tells whether it is scripted to fail; the failure's code is then set. For the fake's sources.
bool FakeCallFails(const char* function, const std::string& arguments);

}  // namespace ferrox::test
