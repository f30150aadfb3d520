#include "services/fileindexd/share_context.h"

#include "fileindex/queue/queue_file.h"
#include "sdk/share.h"

namespace ferrox::indexd {

ShareContext::ShareContext(const std::string& share_name, const WorkerEnvironment& worker_environment)
    : share(share_name),
      root(sdk::SDKShare(share).GetPath()),
      environment(worker_environment),
      queue(sdk::SDKShare(share).GetQueuePath()),
      folders(share, root, environment.instance_patterns),
      applied(fileindex::AppliedFoldersPath(queue.Path())),
      watch({queue.Path()}) {}

}  // namespace ferrox::indexd
