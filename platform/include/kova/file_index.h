#pragma once

#include <stddef.h>

/// Where a share's index and queue live. Programs and daemons that speak of one share come to the same paths by these.
/// Each fills `buffer` with a zero-ended text and returns 0, or below 0 when it does not fit or the argument is
/// unusable (KOVA_ERR_BAD_PARAMETER). `size` is that of the buffer in bytes, the zero included; PATH_MAX is enough for
/// a path. Both paths lie below "/var/lib/kova/fileindex", in the instance's root (kova/instance.h). The file's name is
/// the share's path with "+" between the names; other bytes than letters, digits, "_", "-" and ".", and a "." at the
/// beginning, stand as %XX. A name over 200 bytes is cut, and ended by a hash of the path.

#ifdef __cplusplus
extern "C" {
#endif

/// The index id of the share named `share_name`: "fileindex_" and the name.
int FILEIDXGetIndexID(const char* share_name, char* buffer, size_t size);
/// The folder that holds the index database of the share whose absolute folder is `share_path`: for "/volume1/photo"
/// ".../db/volume1+photo.index". The folder "db" exists when the call has succeeded; it is made for its owner alone
/// (0700).
int FILEIDXDBPathCompose(const char* share_path, char* buffer, size_t size);
/// The event queue file of that share: ".../queue/volume1+photo.queue". Its folder exists when the call has succeeded,
/// likewise; that the queue is there is not said.
int FILEIDXQueuePathCompose(const char* share_path, char* buffer, size_t size);

#ifdef __cplusplus
}
#endif
