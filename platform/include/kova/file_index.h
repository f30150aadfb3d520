#pragma once

#include <stddef.h>

/// Where a share's index and queue live. Programs and daemons that speak of one share come to the same paths by these.
/// Each fills `buffer` with a zero-ended text and returns 0, or below 0 when it does not fit or the argument is
/// unusable.

#ifdef __cplusplus
extern "C" {
#endif

/// The index id of the share named `share_name`: "fileindex_" and the name.
int FILEIDXGetIndexID(const char* share_name, char* buffer, size_t size);
/// The folder that holds the index database of the share whose absolute folder is `share_path`.
int FILEIDXDBPathCompose(const char* share_path, char* buffer, size_t size);
/// The event queue file of that share. Its folder exists when the call has succeeded.
int FILEIDXQueuePathCompose(const char* share_path, char* buffer, size_t size);

#ifdef __cplusplus
}
#endif
