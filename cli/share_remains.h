#pragma once

#include <string>

/// What a share leaves when it goes: its queue, its index, its registration with the notification daemon.
namespace ferrox::cli {

/// The queue of the share whose absolute folder is, or was, `share_path`. @throws Error kInternal.
std::string QueueOf(const std::string& share_path);

/// Whether the engine has an index of that share. @throws Failure as AskEngine.
bool HasIndex(const std::string& share);

/// Drops what may be left of a share without indexed folders: its worker, its index and its queue.
/// @throws Error as the engine's commands do.
void DropRemains(const std::string& share, const std::string& queue_path);

/// Takes a queue out of what the notification daemon writes to. @throws Error kInternal.
void Unregister(const std::string& queue_path);

}  // namespace ferrox::cli
