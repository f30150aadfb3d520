#include "services/kovacontentextractd/extractor.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>

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
std::string OpenProblem() {
  if (errno == ELOOP || errno == EXDEV) return "reached through a link";
  return ErrnoText();
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

Extractor::Extractor(const WorkerPool::Options& options) : pool_(options) { pool_.Probe(Program::kGeneral); }

std::string Extractor::Handle(const std::string& request, const services::Peer& peer) {
  TextTarget text(peer.descriptor);
  std::string reply =
      services::AnswerJsonCommand(request, peer, [&](const std::string& type, const Json::Value& data) -> Json::Value {
        if (type == "status") {
          Json::Value status = pool_.Status();
          status["pid"] = getpid();
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
  const UniqueFd file = OpenBeneath(root, path);
  struct stat info = {};
  if (!file.Valid() && (errno == ENOENT || errno == ENOTDIR)) {
    found["gone"] = true;
  } else if (!file.Valid() || fstat(file.Get(), &info) != 0) {
    found["document"] = ErrorDocument(OpenProblem());
  } else {
    found["inode"] = Json::UInt64(info.st_ino);
    found["document"] = S_ISREG(info.st_mode) ? Read(file.Get(), path, text) : ErrorDocument("not a regular file");
  }
  return found;
}

Json::Value Extractor::Read(int fd, const std::string& path, TextTarget& text) {
  std::array<char, kHeadBytes> head;
  const ssize_t got = pread(fd, head.data(), head.size(), 0);
  if (got < 0) return ErrorDocument(ErrnoText());
  const Task task = {fd, "", GetFileExtension(Basename(path), true), Basename(path)};
  const char* type =
      got == 0 ? TypeByExtension(task.extension) : TypeOf(task.extension, {head.data(), static_cast<size_t>(got)});
  Json::Value document(Json::objectValue);
  if (type != nullptr) document[kTypeField] = type;
  const Format* format = type != nullptr ? FormatOf(type) : &kUnknown;
  if (got == 0 || format == nullptr) return document;
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
