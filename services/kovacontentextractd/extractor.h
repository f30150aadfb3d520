#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include <json/value.h>

#include "base/unique_fd.h"
#include "services/kovacontentextractd/worker_pool.h"
#include "services/support/frame_server.h"
#include "services/support/open_limit.h"

namespace ferrox::extract {

/// Where a file's text goes: into the memory that the client sent as a descriptor with its request, or else into a
/// string for the reply. Pieces come in order; attachments' texts follow the file's own.
class TextTarget {
 public:
  explicit TextTarget(int memory) : memory_(memory) {}
  /// @throws Error kInternal when the memory is too small.
  void Take(size_t offset, std::string_view piece);
  /// The text has `bytes` bytes in all; what was taken beyond does not count.
  void End(size_t bytes);
  /// Adds the text to a reply with this "data": its bytes behind the reply's text, or in "data" how many there are.
  void AddTo(Json::Value& data) const;
  void AddTo(std::string& reply) const;

 private:
  int memory_;        ///< the client's descriptor; below 0: there is none
  size_t bytes_ = 0;  ///< of the whole text
  std::string text_;  ///< when there is no memory
};

/// Gives back what a client's memory took of the system's; the client finds zeros there afterwards.
void FreeTextMemory(int memory);

/// Answers the daemon's requests (docs/formats/extract.md). From any thread. A file is opened here, since workers have
/// no file system, and typed by its name and first bytes; then a worker of the pool reads it, and other workers the
/// files within it. Nothing that a worker says goes into the reply unchecked.
class Extractor {
 public:
  Extractor(const WorkerPool::Options& options, const services::OpenLimit::Options& limit);

  /// One request in, its reply out; never throws.
  std::string Handle(const std::string& request, const services::Peer& peer);

  /// Lets requests that are being answered fail soon.
  void Stop() { pool_.Stop(); }

  /// What the file at `path` below the folder `root` holds: "gone" true, or "inode" and "document". The text is put
  /// into `text`. @throws Error kInternal when nobody can read it now.
  Json::Value Extract(const std::string& root, const std::string& path, TextTarget& text);

 private:
  /// What opening a file gave.
  struct OpenedFile {
    base::UniqueFd fd;
    int problem = 0;     ///< an error number
    uint64_t inode = 0;  ///< 0: unknown
    bool regular = false;
    std::string head;  ///< its first bytes
  };
  // The steps of Extract.
  OpenedFile OpenFile(const std::string& root, const std::string& path);
  Json::Value Read(int fd, std::string_view head, const std::string& path, TextTarget& text);
  Answer ReadFile(const Task& task, std::string_view head, Json::Value& document, const TextSink& sink);
  Answer ReadAs(const kova::content::Format& format, const Task& task, Json::Value& document, const TextSink& sink);
  size_t AddAttachments(const Answer& answer, Json::Value& document, TextTarget& text);

  WorkerPool pool_;
  services::OpenLimit open_limit_;
};

}  // namespace ferrox::extract
