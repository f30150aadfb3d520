#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <optional>
#include <string>

#include "services/support/frame_server.h"

/// In an instance of root's the search engine may be a user of its own, who has no right to anything but the indices.
/// Who that is, is said by the folder that holds the engine's list of indices: its owner. Only root can give that
/// folder away, which `kovaelasticd --prepare` does.
namespace ferrox::services {

struct EngineIds {
  uid_t uid = 0;
  gid_t gid = 0;
};

/// The owner of a folder in /var/lib/kova that only root can have given away. Nothing where it is root's, where the
/// instance is not root's, where others than root could have put another folder there, and where others may enter it.
std::optional<EngineIds> UserOfFolder(const char* folder);

/// The engine's own user. Nothing where the engine is root's, where the instance is not root's, and where others than
/// root could have put another folder there.
std::optional<EngineIds> EngineUser();

/// Lets the engine's own user, if there is one, connect to the socket at `path`, which is the calling process's: by an
/// entry of an ACL, which the socket's owner may set without a capability. What cannot be set is logged; the engine is
/// then refused.
void AdmitEngine(const std::string& path);

/// Whether the peer is the engine's own user.
bool IsEngine(const Peer& peer);

/// Whether others than its owner can change what stands in a folder of this mode. With an ACL the group's bits are its
/// mask. In a folder with the sticky bit, what is root's is safe from others.
bool MayOthersWrite(const struct stat& status);

}  // namespace ferrox::services
