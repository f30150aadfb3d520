#include "services/kovacontentextractd/extractor.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>

#include <kova/content_type.h>

#include "base/open_beneath.h"
#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "services/kovacontentextractd/readers/reader.h"
#include "services/kovacontentextractd/readers/utf8.h"
#include "services/support/json_command.h"

namespace ferrox::extract {

namespace {

using namespace kova::content;

constexpr Limits kLimits;
/// All of a file together, so that nobody can keep a worker busy for minutes with one.
constexpr std::chrono::seconds kAttachmentsLongest(30);

/// What the document says when the file could not be opened.
std::string OpenProblem(int problem) {
  return problem == ELOOP || problem == EXDEV ? "reached through a link" : strerror(problem);
}

/// The first bytes of a file; none, with errno, where they cannot be read.
std::string HeadOf(int fd) {
  std::string head(kHeadBytes, '\0');
  const ssize_t got = pread(fd, head.data(), head.size(), 0);
  head.resize(static_cast<size_t>(std::max<ssize_t>(got, 0)));
  return head;
}

/// Whether a flag is set.
bool Says(const Json::Value& fields, const char* flag) { return fields.get(flag, false).asBool(); }

/// Notes in the document that its text is cut, and at what, unless it says already what it lacks.
void NoteCut(Json::Value& document, size_t text_bytes) {
  constexpr size_t kCharacterMaxBytes = 4;
  if (!Says(document, field::k_KOVATextCut) || document.isMember(field::k_KOVAExtractError)) return;
  const bool full = text_bytes + kCharacterMaxBytes > kLimits.text_bytes;
  const std::string first = "only the first " + std::to_string(kLimits.text_bytes >> 20) + " MiB of its text";
  document[field::k_KOVAExtractError] = std::string(kPartlyRead) + (full ? first : "only the beginning of its text");
}

/// Notes why an attachment could not be read as the reason of the whole document, which has room for one: the first.
void NoteReason(Json::Value& document, const std::string& reason) {
  if (document.isMember(field::k_KOVAExtractError)) return;
  document[field::k_KOVAExtractError] = (reason.starts_with(kPartlyRead) ? "" : "attachment: ") + reason;
}

/// A document that only says why there is nothing else.
Json::Value ErrorDocument(const std::string& reason) {
  Json::Value document;
  document[field::k_KOVAExtractError] = reason;
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

Extractor::Extractor(const WorkerPool::Options& options, const services::OpenLimit::Options& limit)
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

/// A file that is gone has no document; any other has one, if only with the reason why there is nothing else in it.
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
  const services::OpenLimit::Turn turn(open_limit_, root);
  OpenedFile file;
  struct stat info = {};
  file.fd = base::OpenBeneath(root, path);
  if (!file.fd.Valid() || fstat(file.fd.Get(), &info) != 0) {
    file.problem = errno;
    return file;
  }
  file.inode = info.st_ino;
  file.regular = S_ISREG(info.st_mode);
  if (!file.regular) return file;
  errno = 0;
  file.head = HeadOf(file.fd.Get());
  file.problem = errno;
  return file;
}

/// An opened file: its own text and fields, then the texts of the files within it.
Json::Value Extractor::Read(int fd, std::string_view head, const std::string& path, TextTarget& text) {
  Json::Value document(Json::objectValue);
  const TextSink sink = [&text](size_t offset, std::string_view piece) { text.Take(offset, piece); };
  const Task task = {fd, "", GetFileExtension(Basename(path), true), Basename(path)};
  const Answer answer = ReadFile(task, head, document, sink);
  for (const auto& name : answer.fields.getMemberNames()) {
    if (!document.isMember(name)) document[name] = answer.fields[name];
  }
  const size_t text_bytes = AddAttachments(answer, document, text);
  text.End(text_bytes);
  NoteCut(document, text_bytes);
  return document;
}

/// Finds out what the file is, which is put into `document`, and has it read by who can.
Answer Extractor::ReadFile(const Task& task, std::string_view head, Json::Value& document, const TextSink& sink) {
  const char* type = head.empty() ? TypeByExtension(task.extension) : TypeOf(task.extension, head);
  if (type != nullptr) document[field::kKOVAMDContentType] = type;
  const Format* format = type != nullptr ? FormatOf(type) : &kUnknown;
  if (head.empty() || format == nullptr) return {};
  Answer answer = ReadAs(*format, task, document, sink);
  // What only a look at the bytes of an unknown file tells.
  const Format* second = format == &kUnknown ? FormatOf(answer.fields[field::kKOVAMDContentType].asString()) : nullptr;
  if (second != nullptr && answer.text_bytes == 0) {
    document[field::kKOVAMDContentType] = answer.fields[field::kKOVAMDContentType];
    answer = ReadAs(*second, task, document, sink);
  }
  return answer;
}

/// Adds the texts of the files within a file, as far as there is room for them, and the first reason why one could not
/// be read. @return the bytes of all text
size_t Extractor::AddAttachments(const Answer& answer, Json::Value& document, TextTarget& text) {
  const auto end = std::chrono::steady_clock::now() + kAttachmentsLongest;
  size_t bytes = answer.text_bytes;
  for (const AttachedFile& attachment : answer.attachments) {
    const bool full = bytes + 1 >= kLimits.text_bytes;
    const bool late = std::chrono::steady_clock::now() > end;
    if (full) document[field::k_KOVATextCut] = true;
    if (late) NoteReason(document, std::string(kPartlyRead) + "not all of its attachments");
    if (full || late) break;
    if (!attachment.file.Valid()) continue;
    const size_t begin = bytes + 1, room = kLimits.text_bytes - begin;
    size_t taken = 0;
    const TextSink sink = [&](size_t offset, std::string_view piece) {
      if (offset >= room) return;
      const std::string_view fitting = CutAtCharacter(piece, room - offset);
      text.Take(begin + offset, fitting);
      taken = offset + fitting.size();
    };
    text.Take(bytes, "\n");
    const std::string& name = attachment.name;
    Json::Value ignored(Json::objectValue);
    const Task task = {attachment.file.Get(), "", GetFileExtension(name, true), name, kLimits.nesting};
    const Answer found = ReadFile(task, HeadOf(task.fd), ignored, sink);
    if (found.text_bytes > 0) bytes = begin + taken;
    if (found.text_bytes > taken || Says(found.fields, field::k_KOVATextCut)) document[field::k_KOVATextCut] = true;
    const Json::Value& reason = found.fields[field::k_KOVAExtractError];
    if (reason.isString()) NoteReason(document, reason.asString());
    if (!found.attachments.empty()) {
      NoteReason(document, std::string(kPartlyRead) + "not the files within its attachments");
    }
  }
  return bytes;
}

/// Has a worker of the format's program read the file. Where that is not installed, the document says so, with a
/// version that makes the file be read again.
Answer Extractor::ReadAs(const Format& format, const Task& task, Json::Value& document, const TextSink& sink) {
  Task complete = task;
  complete.reader = format.reader;
  if (pool_.Has(format.program)) {
    document[field::k_KOVAExtractVersion] = format.version;
    return pool_.Read(format.program, complete, sink);
  }
  document[field::k_KOVAExtractVersion] = 0;  // so that it is read once the program is there
  Answer answer;
  answer.fields[field::k_KOVAExtractError] =
      std::string("its reader, ") + ProgramName(format.program) + ", is not installed";
  return answer;
}

}  // namespace ferrox::extract
