#include "services/kovacontentextractd/extractor.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include <kova/content_type.h>

#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "services/kovacontentextractd/open_beneath.h"
#include "services/support/json_command.h"

namespace ferrox::extract {

namespace {

using namespace kova::content;

constexpr char kErrorField[] = "_KOVAExtractError";
constexpr char kTypeField[] = "KOVAMDContentType";

/// What the document says when the file could not be opened.
std::string OpenProblem(int problem) {
  return problem == ELOOP || problem == EXDEV ? "reached through a link" : strerror(problem);
}

Json::Value ErrorDocument(const std::string& reason) {
  Json::Value document;
  document[kErrorField] = reason;
  return document;
}

}  // namespace

void TextTarget::Take(size_t offset, std::string_view piece) {
  if (memory_ < 0) {
    text_.resize(offset);
    text_.append(piece);
    return;
  }
  const ssize_t put = pwrite(memory_, piece.data(), piece.size(), static_cast<off_t>(offset));
  FERROX_FAIL_IF(put != static_cast<ssize_t>(piece.size()), Error::kInternal,
                 "the memory for the text cannot be written: " + ErrnoText());
}

void TextTarget::End(size_t bytes) {
  bytes_ = bytes;
  if (memory_ < 0) text_.resize(bytes);
}

void TextTarget::AddTo(Json::Value& data) const {
  if (memory_ >= 0 && bytes_ > 0) data["text_bytes"] = Json::UInt64(bytes_);
}

void TextTarget::AddTo(std::string& reply) const {
  if (!text_.empty()) reply.append(1, '\0').append(text_);
}

void FreeTextMemory(int memory) {
  struct stat info = {};
  if (fcntl(memory, F_GET_SEALS) < 0 || fstat(memory, &info) != 0) return;  // it is no memory
  (void)fallocate(memory, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, 0, info.st_size);
}

Extractor::Extractor(const WorkerPool::Options& options, const OpenLimit::Options& limit)
    : pool_(options), open_limit_(limit) {
  pool_.Probe(Program::kGeneral);
}

std::string Extractor::Handle(const std::string& request, const services::Peer& peer) {
  TextTarget text(peer.descriptor);
  std::string reply =
      services::AnswerJsonCommand(request, peer, [&](const std::string& type, const Json::Value& data) -> Json::Value {
        if (type == "status") {
          Json::Value status = pool_.Status();
          status["pid"] = getpid();
          status["unresponsive"] = open_limit_.Held();
          return status;
        }
        FERROX_FAIL_IF_AS(type != "extract", "type != \"extract\"", Error::kBadArgument, "unknown command " + type);
        std::string root, path;
        GetJsonValue(root, data, "root", true);
        GetJsonValue(path, data, "path", true);
        Json::Value found = Extract(root, path, text);
        text.AddTo(found);
        return found;
      });
  text.AddTo(reply);
  return reply;
}

Json::Value Extractor::Extract(const std::string& root, const std::string& path, TextTarget& text) {
  Json::Value found;
  const OpenedFile file = OpenFile(root, path);
  if (file.problem == ENOENT || file.problem == ENOTDIR) {
    found["gone"] = true;
    return found;
  }
  if (file.inode != 0) found["inode"] = Json::UInt64(file.inode);
  if (file.problem != 0) {
    found["document"] = ErrorDocument(OpenProblem(file.problem));
  } else if (!file.regular) {
    found["document"] = ErrorDocument("not a regular file");
  } else {
    found["document"] = Read(file.fd.Get(), file.head, path, text);
  }
  return found;
}

/// All that is done with the file itself: its file system may not answer for ever.
Extractor::OpenedFile Extractor::OpenFile(const std::string& root, const std::string& path) {
  const OpenLimit::Turn turn(open_limit_, root);
  OpenedFile file;
  struct stat info = {};
  file.fd = OpenBeneath(root, path);
  if (!file.fd.Valid() || fstat(file.fd.Get(), &info) != 0) {
    file.problem = errno;
    return file;
  }
  file.inode = info.st_ino;
  file.regular = S_ISREG(info.st_mode);
  if (!file.regular) return file;
  file.head.resize(kHeadBytes);
  const ssize_t got = pread(file.fd.Get(), file.head.data(), file.head.size(), 0);
  if (got < 0) file.problem = errno;
  file.head.resize(static_cast<size_t>(std::max<ssize_t>(got, 0)));
  return file;
}

Json::Value Extractor::Read(int fd, std::string_view head, const std::string& path, TextTarget& text) {
  const Task task = {fd, "", GetFileExtension(Basename(path), true), Basename(path)};
  const char* type = head.empty() ? TypeByExtension(task.extension) : TypeOf(task.extension, head);
  Json::Value document(Json::objectValue);
  if (type != nullptr) document[kTypeField] = type;
  const Format* format = type != nullptr ? FormatOf(type) : &kUnknown;
  if (head.empty() || format == nullptr) return document;
  const TextSink sink = [&text](size_t offset, std::string_view piece) { text.Take(offset, piece); };
  Answer answer = ReadAs(*format, task, document, sink);
  // What only a look at the bytes of an unknown file tells.
  const Format* second = format == &kUnknown ? FormatOf(answer.fields[kTypeField].asString()) : nullptr;
  if (second != nullptr && answer.text_bytes == 0) {
    document[kTypeField] = answer.fields[kTypeField];
    answer = ReadAs(*second, task, document, sink);
  }
  for (const auto& name : answer.fields.getMemberNames()) {
    if (!document.isMember(name)) document[name] = answer.fields[name];
  }
  text.End(answer.text_bytes);
  return document;
}

Answer Extractor::ReadAs(const Format& format, const Task& task, Json::Value& document, const TextSink& sink) {
  Task complete = task;
  complete.reader = format.reader;
  if (pool_.Has(format.program)) {
    document["_KOVAExtractVersion"] = format.version;
    return pool_.Read(format.program, complete, sink);
  }
  document["_KOVAExtractVersion"] = 0;  // so that it is read once the program is there
  Answer answer;
  answer.fields[kErrorField] = std::string("its reader, ") + ProgramName(format.program) + ", is not installed";
  return answer;
}

}  // namespace ferrox::extract
