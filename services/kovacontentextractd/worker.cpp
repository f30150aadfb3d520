#include "services/kovacontentextractd/worker.h"

#include <malloc.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <new>
#include <string>

#include <json/writer.h>

#include "services/kovacontentextractd/sandbox.h"
#include "services/kovacontentextractd/worker_protocol.h"

namespace ferrox::extract {

namespace {

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

bool WriteAll(const void* from, size_t size) {
  const auto* bytes = static_cast<const char*>(from);
  while (size > 0) {
    const ssize_t put = write(kWorkerSocket, bytes, size);
    if (put < 0 && errno == EINTR) continue;
    if (put <= 0) return false;
    bytes += put;
    size -= static_cast<size_t>(put);
  }
  return true;
}

std::string ToText(const Json::Value& value) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  builder["emitUTF8"] = true;
  return Json::writeString(builder, value);
}

/// The JSON text and, behind a zero byte, the file's text as it is: quoting a megabyte costs more than reading it did.
bool Answer(uint32_t number, const Json::Value& fields, const std::string& text = {}) {
  std::string begin = ToText(fields);
  if (!text.empty()) begin += '\0';
  const AnswerHeader header = {static_cast<uint32_t>(begin.size() + text.size()), number};
  begin.insert(0, reinterpret_cast<const char*>(&header), sizeof(header));
  return WriteAll(begin.data(), begin.size()) && WriteAll(text.data(), text.size());
}

struct Request {
  uint32_t number = 0;
  std::string reader;
  Source source;
};

/// The header and the descriptor that comes with it. False when the daemon has hung up, or makes no sense.
bool ReceiveHeader(RequestHeader& header, int& fd) {
  alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int))] = {};
  iovec part = {&header, sizeof(header)};
  msghdr message = {};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  message.msg_control = control;
  message.msg_controllen = sizeof(control);
  ssize_t got;
  do {
    got = recvmsg(kWorkerSocket, &message, MSG_CMSG_CLOEXEC);
  } while (got < 0 && errno == EINTR);
  const cmsghdr* ancillary = CMSG_FIRSTHDR(&message);
  if (got <= 0 || ancillary == nullptr || ancillary->cmsg_type != SCM_RIGHTS) return false;
  memcpy(&fd, CMSG_DATA(ancillary), sizeof(fd));
  return ReadAll(reinterpret_cast<char*>(&header) + got, sizeof(header) - static_cast<size_t>(got));
}

bool ReceiveRequest(Request& request) {
  RequestHeader header;
  if (!ReceiveHeader(header, request.source.fd)) return false;
  request.number = header.number;
  request.reader.resize(header.reader_bytes);
  request.source.extension.resize(header.extension_bytes);
  request.source.name.resize(header.name_bytes);
  struct stat info = {};
  if (fstat(request.source.fd, &info) == 0) request.source.size = static_cast<uint64_t>(info.st_size);
  return ReadAll(request.reader.data(), request.reader.size()) &&
         ReadAll(request.source.extension.data(), request.source.extension.size()) &&
         ReadAll(request.source.name.data(), request.source.name.size());
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

/// What one file took, the next one takes: without this, every one would ask the kernel for it and give it back.
void KeepMemory() {
  (void)mallopt(M_MMAP_THRESHOLD, 32 << 20);
  (void)mallopt(M_TRIM_THRESHOLD, 256 << 20);
}

}  // namespace

int RunWorker(const Worker& worker, const char* empty_folder) try {
  KeepMemory();
  worker.prepare();
  Json::Value greeting(Json::objectValue);
  greeting["missing"] = Json::Value(Json::arrayValue);
  for (const std::string& piece : CloseSandbox(empty_folder)) greeting["missing"].append(piece);
  bool connected = Answer(0, greeting);
  for (Request request; connected && ReceiveRequest(request);) {
    Findings findings;
    LimitCpuTime(kCpuSecondsPerFile);
    Read(worker, request, findings);
    LimitCpuTime(0);
    (void)close(request.source.fd);
    connected = Answer(request.number, findings.ToFields(), findings.Text());
  }
  return 0;
} catch (const std::bad_alloc&) {
  return kExitNoMemory;
}

}  // namespace ferrox::extract
