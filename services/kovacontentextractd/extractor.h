#pragma once

#include <string>

#include <json/value.h>

#include "services/kovacontentextractd/worker_pool.h"
#include "services/support/frame_server.h"

namespace ferrox::extract {

/// Answers what the daemon is asked (docs/formats/extract.md). From any thread.
class Extractor {
 public:
  explicit Extractor(const WorkerPool::Options& options);

  /// One request in, its reply out; never throws.
  std::string Handle(const std::string& request, const services::Peer& peer);

  /// What the file at `path` below the folder `root` holds: "gone" true, or "inode" and "document". The text is put
  /// into `text`. @throws Error kInternal when nobody can read it now.
  Json::Value Extract(const std::string& root, const std::string& path, std::string& text);

 private:
  Json::Value Read(int fd, const std::string& path, std::string& text);
  Answer ReadAs(const kova::content::Format& format, const Task& task, Json::Value& document, const TextSink& sink);

  WorkerPool pool_;
};

}  // namespace ferrox::extract
