#pragma once

#include <map>
#include <memory>
#include <string>

#include <json/forwards.h>

namespace ferrox::fileindex {

class QueuedReindexes;

/// For operations that queue many events, such as a list of folders to reindex: queues events one after the other, each
/// as AddCustomEvent does; but what a queue held when its first event came is read only once, not once for each event.
/// All events of one writer tell of changes that were made before its first: a reindex that waited then will see them
/// all.
class CustomEventWriter {
 public:
  CustomEventWriter();
  ~CustomEventWriter();
  CustomEventWriter(const CustomEventWriter&) = delete;
  CustomEventWriter& operator=(const CustomEventWriter&) = delete;

  /// @throws Error as AddCustomEvent does, with the share marked likewise.
  void Add(int event, const std::string& path, const std::string& path_old, const Json::Value& data);

 private:
  std::map<std::string, std::unique_ptr<QueuedReindexes>> queues_;  ///< by the queue's path
};

}  // namespace ferrox::fileindex
