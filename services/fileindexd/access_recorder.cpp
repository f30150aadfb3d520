#include "services/fileindexd/access_recorder.h"

#include <cstddef>

#include <kova/content_extract.h>

#include "common/error.h"
#include "services/fileindexd/file_presence.h"

namespace ferrox::indexd {

namespace {

/// How many times the rights of a file are recorded while they keep changing. Each change has an event of its own, so
/// the last is not missed.
constexpr int kRecordingsMax = 3;

}  // namespace

bool SameRights(const struct stat& a, const struct stat& b) {
  return a.st_uid == b.st_uid && a.st_gid == b.st_gid && a.st_mode == b.st_mode &&
         a.st_ctim.tv_sec == b.st_ctim.tv_sec && a.st_ctim.tv_nsec == b.st_ctim.tv_nsec;
}

std::set<std::string> AccessRecorder::Record(std::vector<std::string> paths) {
  std::set<std::string> left;
  for (int i = 0; i < kRecordingsMax && !paths.empty(); ++i) {
    const Seen seen = Examine(paths, left);
    if (!seen.records.empty()) Send(seen, left);
    paths = ChangedSince(seen);
  }
  return left;
}

AccessRecorder::Seen AccessRecorder::Examine(const std::vector<std::string>& paths, std::set<std::string>& left) {
  Seen seen;
  seen.records.reserve(paths.size());
  seen.status.reserve(paths.size());
  for (const std::string& path : paths) {
    struct stat status = {};
    if (PresenceOf(path, status) != Presence::kThere) {
      left.insert(path);
      continue;
    }
    seen.records.push_back({path, KOVA::CONTENT_EXTRACT::Stamp(status), KOVA::CONTENT_EXTRACT::Access(path, status)});
    seen.status.push_back(status);
  }
  return seen;
}

void AccessRecorder::Send(const Seen& seen, std::set<std::string>& left) {
  try {
    const AccessGaps gaps = index_.SetAccess(seen.records);
    for (const size_t position : gaps.differing) left.insert(seen.records[position].path);
    for (const size_t position : gaps.missing) left.insert(seen.records[position].path);
    status_.DocumentsWritten(seen.records.size() - gaps.differing.size() - gaps.missing.size());
  } catch (const Error& error) {
    // One of them may be why the engine refuses all: alone, it is refused alone.
    if (error.Code() != Error::kEngineBadRequest) throw;
    for (const wire::SeenAccess& record : seen.records) left.insert(record.path);
  }
}

std::vector<std::string> AccessRecorder::ChangedSince(const Seen& seen) {
  std::vector<std::string> changed;
  for (size_t i = 0; i < seen.records.size(); ++i) {
    struct stat now = {};
    const bool is_there = PresenceOf(seen.records[i].path, now) == Presence::kThere;
    if (is_there && !SameRights(seen.status[i], now)) changed.push_back(seen.records[i].path);
  }
  return changed;
}

}  // namespace ferrox::indexd
