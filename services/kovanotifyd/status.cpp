#include "services/kovanotifyd/status.h"

#include <utility>

namespace ferrox::notifyd {

std::vector<QueueStatus> QueueStatusOf(const Registry& registry, const WatchSet& watches, const QueueRouter& router) {
  std::vector<QueueStatus> queues;
  const std::map<std::string, QueueFigures> figures = router.Figures();
  for (const Registration& registration : registry.list) {
    QueueStatus queue = {registration.queue, registration.application, {}, {}};
    for (const QueueWatch& watch : registration.watches) queue.watches.push_back({watch.path, watches.StateOf(watch)});
    if (const auto found = figures.find(registration.queue); found != figures.end()) queue.figures = found->second;
    queues.push_back(std::move(queue));
  }
  return queues;
}

}  // namespace ferrox::notifyd
