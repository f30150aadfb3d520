#pragma once

/// Services and programs. Failures are recorded for the calling thread (kova/error.h).

#ifdef __cplusplus
extern "C" {
#endif

enum { KLIB_SERVICECTL_UPSTART = 1 };

/// Start or stop the named service and wait until it has. 0, also when it was so already; below 0 on failure.
/// An instance knows the services "kovaelasticd", "kovacontentextractd", "kovanotifyd" and "pkg-Ferrox-fileindexd"
/// and runs them as child processes of its own, each with a pid file; blocks for at most 10 s to start, 20 s to stop.
int KLIBServiceStart(const char* name, int now);
int KLIBServiceStop(const char* name, int now);
int KLIBServiceRestart(const char* name);
int KLIBServicectlStart(const char* name, int kind);
int KLIBServicectlStop(const char* name, int kind);
/// 1 when the service runs, 0 when not, below 0 when the name is unknown.
int KLIBServiceIsRunning(const char* name);

/// Runs `path` with the given arguments (the list ends with a null `char*`), without a shell, and waits for it.
/// Returns its exit status, below 0 when it could not be started or was killed.
int KLIBCExec(const char* path, const char* argument, ...) __attribute__((sentinel));
/// The same. `options` is passed over: on this host it has no meaning.
int KLIBCExecl(const char* path, unsigned int options, const char* argument, ...) __attribute__((sentinel));

#ifdef __cplusplus
}
#endif
