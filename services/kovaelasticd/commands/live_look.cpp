#include "services/kovaelasticd/commands/live_look.h"

#include <optional>

#include "base/file_stamp.h"

namespace ferrox::engine {

namespace {

constexpr std::chrono::milliseconds kLongestLook{3000};

}  // namespace

std::vector<wire::LiveFile> LookOnDisk(const Asker& asker, const std::vector<std::string>& paths) {
  return wire::LookAs(asker.uid, asker.groups, asker.share_root, paths, kLongestLook);
}

bool IsSameAndReadable(const std::string& stamp, bool is_folder, const wire::LiveFile& live) {
  const std::optional<base::FileStamp> noted = base::FileStamp::Parse(stamp);
  const std::optional<base::FileStamp> seen = base::FileStamp::Parse(live.stamp);
  if (!live.readable || live.folder != is_folder || !noted.has_value() || !seen.has_value()) return false;
  return is_folder ? noted->SameFile(*seen) : *noted == *seen;
}

}  // namespace ferrox::engine
