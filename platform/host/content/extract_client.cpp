#include "platform/host/content/extract_client.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <string_view>
#include <utility>

#include <json/value.h>
#include <json/writer.h>

#include <kova/content_extract.h>
#include <kova/instance.h>
#include <kova/service.h>
#include <kova/sock_connection.h>

#include "base/json.h"
#include "base/mutex.h"
#include "base/path.h"
#include "platform/host/child_service.h"
#include "platform/host/share_table.h"
#include "platform/shared/frames.h"
#include "wire/fields.h"

namespace kova::content {

namespace {

namespace field = ferrox::fileindex::elastic;

using SteadyClock = std::chrono::steady_clock;

constexpr char kService[] = "kovacontentextractd";
constexpr char kSocket[] = "/var/run/kovacontentextractd.sock";
/// Of the text of one file.
constexpr uint32_t kTextMaxBytes = 1U << 20;
/// An answer holds at most a text, and fields.
constexpr uint32_t kMessageMaxBytes = 16U << 20;
constexpr int kSendMaxMs = 60000;
/// After a start that failed, no other is tried for so long.
constexpr std::chrono::seconds kStartPause{5};

thread_local std::string t_problem;

[[noreturn]] void ThrowProblem(const std::string& problem) {
  t_problem = problem;
  throw std::runtime_error(problem);
}

/// The folder that the file must be reached from without a link: its share's, else its own.
std::string RootOf(const std::string& path) {
  const std::shared_ptr<const host::ShareTable> table = host::ShareTable::Current();
  const host::ShareEntry* entry = table != nullptr ? table->ByFullPath(path) : nullptr;
  return entry != nullptr && entry->path != path ? entry->path : base::FolderOf(path);
}

/// Starts the daemon once for all threads that find it missing. @return "" when it runs, else the reason.
std::string StartDaemon() {
  static base::Mutex mutex;
  static SteadyClock::time_point failed_at BASE_GUARDED_BY(mutex);
  static std::string failure BASE_GUARDED_BY(mutex);
  const base::MutexLock lock(mutex);
  if (!failure.empty() && SteadyClock::now() - failed_at < kStartPause) return failure;
  failure.clear();
  if (KLIBServiceStart(kService, 1) >= 0) return {};
  const std::string reason = host::LastServiceProblem();
  failed_at = SteadyClock::now();
  return failure = reason.empty() ? "it could not be started" : reason;
}

/// The calling thread's connection to the daemon, which is kept for its next file, and the memory into which the daemon
/// puts a file's text: through a socket it would be copied twice more.
class Channel {
 public:
  Channel() = default;
  Channel(const Channel&) = delete;
  Channel& operator=(const Channel&) = delete;
  ~Channel() { Close(); }

  /// Nothing when the daemon does not run, or ends meanwhile.
  std::optional<std::string> Ask(const std::string& request) {
    if (!IsOpen() && !Open()) return std::nullopt;
    std::string reply;
    if (Exchange(request, reply)) return reply;
    Close();
    return std::nullopt;
  }

  /// The first bytes of the memory; nothing when there are not so many.
  std::optional<std::string_view> Memory(size_t bytes) const {
    if (memory_ < 0 || bytes > kTextMaxBytes) return std::nullopt;
    return std::string_view(static_cast<const char*>(mapped_), bytes);
  }

 private:
  bool Exchange(const std::string& request, std::string& reply) {
    const kovadaemon::SocketWait wait(socket_);
    const int descriptor = std::exchange(told_, true) ? -1 : memory_;
    return kova::SendFrame(socket_, request, kMessageMaxBytes, kSendMaxMs, descriptor) &&
           kova::RecvFrame(socket_, reply, kMessageMaxBytes);
  }

  /// The daemon ends what has been idle for long; that is readable here.
  bool IsOpen() {
    pollfd state = {socket_, POLLIN, 0};
    if (socket_ >= 0 && poll(&state, 1, 0) == 0) return true;
    Close();
    return false;
  }

  bool Open() {
    socket_ = kova::ConnectUnixSocket(InstanceRoot() + kSocket);
    if (socket_ < 0) return false;
    MakeMemory();
    return true;
  }

  /// Without it, texts come with the replies.
  void MakeMemory() {
    memory_ = memfd_create("kova text", MFD_CLOEXEC | MFD_ALLOW_SEALING);
    const bool sized = memory_ >= 0 && ftruncate(memory_, kTextMaxBytes) == 0 &&
                       fcntl(memory_, F_ADD_SEALS, F_SEAL_GROW | F_SEAL_SHRINK | F_SEAL_SEAL) == 0;
    mapped_ = sized ? mmap(nullptr, kTextMaxBytes, PROT_READ, MAP_SHARED, memory_, 0) : MAP_FAILED;
    if (mapped_ == MAP_FAILED && memory_ >= 0) (void)close(std::exchange(memory_, -1));
  }

  void Close() {
    if (socket_ >= 0) (void)close(std::exchange(socket_, -1));
    if (mapped_ != MAP_FAILED) (void)munmap(std::exchange(mapped_, MAP_FAILED), kTextMaxBytes);
    if (memory_ >= 0) (void)close(std::exchange(memory_, -1));
    told_ = false;
  }

  int socket_ = -1;
  int memory_ = -1;
  void* mapped_ = MAP_FAILED;
  bool told_ = false;  ///< the daemon has the memory's descriptor
};

thread_local Channel t_channel;

std::string Ask(const std::string& request) {
  std::optional<std::string> reply = t_channel.Ask(request);
  if (reply) return *std::move(reply);
  const std::string problem = StartDaemon();
  if (!problem.empty()) ThrowProblem("content cannot be read: " + problem);
  reply = t_channel.Ask(request);
  if (!reply) ThrowProblem("content cannot be read: kovacontentextractd ends before it answers; see its log");
  return *std::move(reply);
}

std::string RequestText(const std::string& path) {
  Json::Value request;
  request["type"] = "extract";
  request["data"]["root"] = RootOf(path);
  request["data"]["path"] = path;
  thread_local const std::unique_ptr<Json::StreamWriter> writer = [] {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    return std::unique_ptr<Json::StreamWriter>(builder.newStreamWriter());
  }();
  std::ostringstream text;
  (void)writer->write(request, &text);
  return text.str();
}

/// The text of a file: in the memory, or behind the reply's JSON and a zero byte. False when there is not so much.
bool FindText(const std::string& reply, size_t json_bytes, const Json::Value& data, std::string_view& text) {
  if (json_bytes < reply.size()) text = std::string_view(reply).substr(json_bytes + 1);
  const Json::Value& bytes = data["text_bytes"];
  if (bytes.isNull()) return true;
  const auto found = bytes.isUInt() ? t_channel.Memory(bytes.asUInt()) : std::nullopt;
  if (found) text = *found;
  return found.has_value();
}

bool ReadReply(const std::string& reply, Json::Value& json, std::string_view& text) try {
  const size_t json_bytes = std::min(reply.find('\0'), reply.size());
  const std::string_view json_text = std::string_view(reply).substr(0, json_bytes);
  if (!base::ParseJson(json_text, base::JsonRules::kAnyValue, json) || !json.isObject()) return false;
  if (!json["success"].isBool() || json["data"].isObject() != json["success"].asBool()) return false;
  return FindText(reply, json_bytes, json["data"], text);
} catch (const std::exception&) {
  return false;
}

}  // namespace

Extraction ExtractContent(const std::string& path) {
  Json::Value json;
  std::string_view text;
  const std::string reply = Ask(RequestText(path));
  if (!ReadReply(reply, json, text)) ThrowProblem("content cannot be read: kovacontentextractd answers nonsense");
  if (!json["success"].asBool()) ThrowProblem("content cannot be read: " + json["error"]["msg"].asString());
  Extraction extraction;
  Json::Value& data = json["data"];
  extraction.gone = data["gone"].isBool() && data["gone"].asBool();
  extraction.inode = data["inode"].isUInt64() ? data["inode"].asUInt64() : 0;
  extraction.document = std::move(data["document"]);
  if (!text.empty())
    extraction.document[field::kKOVAMDTextContent] = Json::Value(text.data(), text.data() + text.size());
  return extraction;
}

void ClearExtractionProblem() { t_problem.clear(); }

}  // namespace kova::content

std::string KOVA::CONTENT_EXTRACT::ExtractionProblem() { return kova::content::t_problem; }
