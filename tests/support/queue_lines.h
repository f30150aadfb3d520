#pragma once

#include <string>
#include <vector>

#include <json/value.h>

#include "common/json_util.h"
#include "fileindex/optree/optree.h"
#include "tests/support/temp_dir.h"

/// Queue lines as their writers write them.
namespace ferrox::test {

inline std::string Line(uint32_t event, const std::string& path, const std::string& path_old = "", bool is_dir = false,
                        const Json::Value& data = Json::Value()) {
  Json::Value line;
  line["event"] = event;
  line["is_dir"] = is_dir;
  line["path"] = path;
  line["path_old"] = path_old;
  line["data"] = data;
  return toString(line);
}

inline std::string Create(const std::string& path) { return Line(fileindex::EVENT_CREATE, path); }
inline std::string Modify(const std::string& path) { return Line(fileindex::EVENT_MODIFY, path); }
inline std::string Attr(const std::string& path) { return Line(fileindex::EVENT_ATTR, path); }
inline std::string Delete(const std::string& path) { return Line(fileindex::EVENT_DELETE, path); }
inline std::string Reindex(const std::string& path) { return Line(fileindex::EVENT_REINDEX, path); }
inline std::string Crash(const std::string& path) { return Line(fileindex::EVENT_QUEUE_CRASHED, path); }
inline std::string Rename(const std::string& from, const std::string& to) {
  return Line(fileindex::EVENT_RENAME, to, from);
}
inline std::string UpdateCfg(const std::string& path, const std::string& flag, bool on = true) {
  Json::Value data;
  data[flag] = on;
  return Line(fileindex::EVENT_UPDATE_CFG, path, "", true, data);
}

inline void WriteQueue(const std::string& path, const std::vector<std::string>& lines) {
  std::string text;
  for (const std::string& line : lines) text += line + "\n";
  WriteFile(path, text);
}

}  // namespace ferrox::test
