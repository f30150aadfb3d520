#include "services/kovacontentextractd/worker.h"

#include <malloc.h>
#include <sched.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <sstream>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include <json/writer.h>

#include "base/descriptor_passing.h"
#include "base/files.h"
#include "services/kovacontentextractd/sandbox.h"
#include "services/kovacontentextractd/worker_protocol.h"

namespace ferrox::extract {

namespace {

/// Reads exactly `size` bytes from the daemon; false when it has hung up.
bool ReadAll(void* to, size_t size) {
  auto* bytes = static_cast<char*>(to);
  while (size > 0) {
    const ssize_t got = read(kWorkerSocket, bytes, size);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return false;
    bytes += got;
    size -= static_cast<size_t>(got);
  }
  return true;
}

/// JSON in one line; one writer for all answers.
std::string ToText(const Json::Value& value) {
  static const std::unique_ptr<Json::StreamWriter> writer = [] {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    return std::unique_ptr<Json::StreamWriter>(builder.newStreamWriter());
  }();
  std::ostringstream text;
  text.exceptions(std::ios::badbit);  // else a text that memory was too short for would be cut off unnoticed
  (void)writer->write(value, &text);
  return text.str();
}

bool Answer(uint32_t number, const Json::Value& fields, size_t text_bytes = 0) {
  std::string bytes = ToText(fields);
  const AnswerHeader header = {static_cast<uint32_t>(bytes.size()), static_cast<uint32_t>(text_bytes), number};
  bytes.insert(0, reinterpret_cast<const char*>(&header), sizeof(header));
  return base::WriteAll(kWorkerSocket, bytes);
}

/// Text and attachments go to the region, to which `region` points: through a socket they would be copied twice more.
bool Answer(char* region, uint32_t number, const Findings& findings) {
  static_assert(kAttachmentsAt >= Limits().text_bytes && kRegionBytes - kAttachmentsAt >= Limits().attached_bytes);
  const std::string& text = findings.Text();
  memcpy(region, text.data(), text.size());
  Json::Value fields = findings.ToFields();
  char* next = region + kAttachmentsAt;
  for (const Attachment& attachment : findings.Attachments()) {
    memcpy(next, attachment.bytes.data(), attachment.bytes.size());
    next += attachment.bytes.size();
    Json::Value& listed = fields[kAttachmentsMember].append(Json::Value());
    listed["name"] = attachment.name;
    listed["bytes"] = Json::UInt64(attachment.bytes.size());
  }
  return Answer(number, fields, text.size());
}

/// A file to read, as the daemon asks for it. The descriptor is the worker's to close.
struct Request {
  uint32_t number = 0;
  std::string reader;
  Source source;
};

/// Takes the next `size` bytes of a request. What has not come with its beginning is read.
bool TakeText(std::string_view& come, size_t size, std::string& text) {
  text = come.substr(0, size);
  come.remove_prefix(text.size());
  const size_t have = text.size();
  text.resize(size);
  return have == size || ReadAll(text.data() + have, size - have);
}

/// False when the daemon has hung up, or makes no sense.
bool ReceiveRequest(Request& request) {
  std::array<char, 1024> buffer;
  RequestHeader header;
  const ssize_t got = base::ReceiveWithDescriptors(kWorkerSocket, buffer.data(), buffer.size(), &request.source.fd, 1);
  if (got < static_cast<ssize_t>(sizeof(header)) || request.source.fd < 0) return false;
  memcpy(&header, buffer.data(), sizeof(header));
  request.number = header.number;
  request.source.depth = header.depth;
  struct stat info = {};
  if (fstat(request.source.fd, &info) == 0) request.source.size = static_cast<uint64_t>(info.st_size);
  std::string_view come(buffer.data() + sizeof(header), static_cast<size_t>(got) - sizeof(header));
  return TakeText(come, header.reader_bytes, request.reader) &&
         TakeText(come, header.extension_bytes, request.source.extension) &&
         TakeText(come, header.name_bytes, request.source.name);
}

/// A reader gives its memory back on its way out, so that one greedy file does not cost the process.
void Read(const Worker& worker, const Request& request, Findings& findings) try {
  for (size_t i = 0; i < worker.reader_count; ++i) {
    if (request.reader == worker.readers[i].name) return worker.readers[i].reader(request.source, findings);
  }
  findings.Fail("no reader");
} catch (const std::bad_alloc&) {
  findings.Fail("needs too much memory");
} catch (const std::exception&) {
  findings.Fail("damaged");
}

/// Ignores the signals that end a service: a service manager may send them to all processes of the daemon. A worker
/// goes on until the daemon ends it or has died itself: else the file that it reads would be blamed.
void LeaveEndToDaemon() {
  for (const int number : {SIGTERM, SIGINT, SIGHUP, SIGQUIT}) (void)signal(number, SIG_IGN);
}

/// What one file took, the next one takes: without this, every one would ask the kernel for it and give it back.
void KeepMemory() {
  (void)mallopt(M_MMAP_THRESHOLD, 32 << 20);
  (void)mallopt(M_TRIM_THRESHOLD, 256 << 20);
}

/// Reads files for the daemon until that hangs up.
int ReadFiles(const Worker& worker, std::vector<std::string> missing, int region_fd) {
  void* const mapped = mmap(nullptr, kRegionBytes, PROT_READ | PROT_WRITE, MAP_SHARED, region_fd, 0);
  if (mapped == MAP_FAILED) return kExitNoMemory;
  (void)close(region_fd);
  char* const region = static_cast<char*>(mapped);
  Json::Value greeting(Json::objectValue);
  greeting["missing"] = Json::Value(Json::arrayValue);
  for (std::string& piece : CloseSandbox()) missing.push_back(std::move(piece));
  for (const std::string& piece : missing) greeting["missing"].append(piece);
  bool connected = Answer(0, greeting);
  for (Request request; connected && ReceiveRequest(request);) {
    Findings findings;
    LimitCpuTime(kCpuSecondsPerFile);  // what the last file has left does not run while nothing is done
    Read(worker, request, findings);
    (void)close(request.source.fd);
    connected = Answer(region, request.number, findings);
  }
  return 0;
}

/// Forks. The new process is a child of the daemon and not of this one, so that the daemon learns how it ends.
pid_t Fork() { return static_cast<pid_t>(syscall(SYS_clone, CLONE_PARENT | SIGCHLD, 0, 0, 0, 0)); }

/// Waits for a worker to be asked for. @return false when the daemon has hung up
bool ReceiveFork(int& socket, int& region) {
  char request = 0;
  int descriptors[2];
  const ssize_t got = base::ReceiveWithDescriptors(kWorkerSocket, &request, sizeof(request), descriptors, 2);
  socket = descriptors[0];
  region = descriptors[1];
  return got == 1 && request == kForkRequest && socket >= 0;
}

}  // namespace

int RunWorker(const Worker& worker, const char* empty_folder) try {
  LeaveEndToDaemon();
  KeepMemory();
  (void)setenv("TZ", "UTC0", 1);  // else each time in an archive makes the C library look for the zone's file
  worker.prepare();
  const std::vector<std::string> missing = GiveUpRights(empty_folder);
  for (int socket, region; ReceiveFork(socket, region);) {
    const pid_t pid = Fork();
    const ForkAnswer answer = {pid < 0 ? -errno : pid};
    if (answer.pid == 0) {
      if (dup2(socket, kWorkerSocket) < 0 || close(socket) != 0) return EXIT_FAILURE;
      return ReadFiles(worker, missing, region);
    }
    (void)close(socket);
    (void)close(region);
    if (!base::WriteAll(kWorkerSocket, {reinterpret_cast<const char*>(&answer), sizeof(answer)})) return EXIT_FAILURE;
  }
  return 0;
} catch (const std::bad_alloc&) {
  return kExitNoMemory;
}

}  // namespace ferrox::extract
