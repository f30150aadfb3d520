#pragma once

#include <string>

#include <json/value.h>

/// Which folders the notification daemon watches, and into which queues it reports. Kept on disk, so that it survives
/// the daemon and the host's restart: a registration is made once. A daemon that runs takes it up by itself, another
/// when it starts. docs/formats/notifyd.md has the form, and what is reported for each bit of a mask.
namespace KOVA::KOVANOTIFYD {

enum MonitorQueueType { MONITOR_QUEUE_TYPE_APPLICATION = 1 };

/// One queue and what is watched for it: {"queue": path, "config": [{"path", "mask", "ignore": [names]}, ...]}. "path"
/// is an absolute folder, which is watched with all below it; "mask" has a bit for each kind of change that is wanted;
/// what has a name of "ignore", anywhere below, is not watched, and neither is what lies in it.
class __attribute__((visibility("default"))) MonitorQueue {
 public:
  /// Takes the document as it is; Upsert checks it.
  explicit MonitorQueue(const Json::Value& document) : document_(document) {}
  const Json::Value& Document() const { return document_; }

  /// Registers a queue for `application`, in place of an earlier registration of the same queue, application and type.
  /// Atomic and durable; a folder whose path ends in "/" is left out, and logged; blocks while another process changes
  /// the registry. False, with the failure recorded (see kova/error.h) and the registry as it was, when the document is
  /// not of the form above or cannot be kept.
  static bool Upsert(const MonitorQueue& queue, const std::string& application, int type);
  /// Removes a registration; true also when there is none. Atomic and durable likewise, and blocks likewise.
  static bool Delete(const std::string& queue_path, const std::string& application, int type);

 private:
  Json::Value document_;
};

}  // namespace KOVA::KOVANOTIFYD
