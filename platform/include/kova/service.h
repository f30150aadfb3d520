#pragma once

/// Services and programs. Failures are recorded for the calling thread (kova/error.h).

#ifdef __cplusplus
extern "C" {
#endif

enum { KLIB_SERVICECTL_UPSTART = 1 };

/// Start or stop the named service and wait until it has. 0, also when it was so already; below 0 on failure.
/// An instance knows the services "kovaelasticd", "kova-access", "kovacontentextractd", "kovanotifyd" and
/// "pkg-Ferrox-fileindexd" and runs them as child processes of its own, each with a pid file; blocks for at most 10 s
/// to start, 20 s to stop. On a host that systemd runs, outside of instances, they are its units, and "samba" is a
/// service as well; a call then blocks for as long as systemctl does. An unknown name, or one that is not installed, is
/// KOVA_ERR_NOT_SUPPORTED. A restart of a child process is a stop and a start; nothing is started when the stop fails.
/// `now` and `kind` are passed over.
int KLIBServiceStart(const char* name, int now);
int KLIBServiceStop(const char* name, int now);
int KLIBServiceRestart(const char* name);
int KLIBServicectlStart(const char* name, int kind);
int KLIBServicectlStop(const char* name, int kind);
/// 1 when the service runs, 0 when not, below 0 when the name is unknown.
int KLIBServiceIsRunning(const char* name);

/// Runs `path` with the given arguments (the list ends with a null `char*`), without a shell, and waits for it.
/// Returns its exit status, below 0 when it could not be started or was killed. `path` is not looked for in PATH, and
/// is the program's first argument; `argument` is the next. Environment and standard streams are the caller's, but
/// no signal is blocked in it. There is no limit to the wait.
///   if (KLIBCExec("/bin/cp", "-a", source, target, (char*)NULL) != 0) return -1;
int KLIBCExec(const char* path, const char* argument, ...) __attribute__((sentinel));
/// The same. `options` is passed over: on this host it has no meaning.
int KLIBCExecl(const char* path, unsigned int options, const char* argument, ...) __attribute__((sentinel));

#ifdef __cplusplus
}
#endif
