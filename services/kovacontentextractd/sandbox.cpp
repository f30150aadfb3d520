#include "services/kovacontentextractd/sandbox.h"

#include <fcntl.h>
#include <grp.h>
#include <linux/capability.h>
#include <linux/futex.h>
#include <linux/landlock.h>
#include <seccomp.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <sys/time.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <memory>

#include "base/priority.h"
#include "services/kovacontentextractd/worker_protocol.h"

namespace ferrox::extract {

namespace {

// Layers that cover for each other: no privileges and an empty root (GiveUpRights); resource limits, Landlock and
// seccomp (CloseSandbox). A kernel or a container may lack some of them: what is missing is reported and logged, and
// the worker runs nevertheless.

constexpr uid_t kNobody = 65534;
/// In all its life; a worker is replaced after some hundreds of files.
constexpr rlim_t kCpuSecondsPerProcess = 3600;
constexpr rlim_t kFilesMax = 16;  // the three usual ones, the daemon's socket, the file, and copies of it

/// Sets a soft and a hard limit.
bool Limit(__rlimit_resource resource, rlim_t value) {
  const rlimit limit = {value, value};
  return setrlimit(resource, &limit) == 0;
}

bool LimitResources() {
  constexpr rlim_t kAddressSpace = (sizeof(void*) == 4 ? 128UL : 256UL) << 20;
  const bool memory = kSanitized || Limit(RLIMIT_AS, kAddressSpace);
  const bool files = Limit(RLIMIT_NOFILE, kFilesMax) && Limit(RLIMIT_FSIZE, 0) && Limit(RLIMIT_CORE, 0);
  // Each file has a limit of its own; this one is for what has taken the process over and outlives the daemon.
  const bool time = Limit(RLIMIT_CPU, kCpuSecondsPerProcess);
  return memory && files && time && Limit(RLIMIT_NPROC, 0);
}

bool BecomeUser(uid_t user) { return setresgid(user, user, user) == 0 && setresuid(user, user, user) == 0; }

/// Above all numbers that hosts and user namespaces give out. Each template has another, so that its workers can do
/// nothing to those of others, nor to what else runs as the user "nobody".
uid_t OwnUser() { return 0x80000000U + static_cast<uid_t>(getpid()); }

/// Also those of a user other than root, which a service manager may have given.
bool DropCapabilities() {
  __user_cap_header_struct header = {_LINUX_CAPABILITY_VERSION_3, 0};
  const __user_cap_data_struct none[_LINUX_CAPABILITY_U32S_3] = {};
  return syscall(SYS_capset, &header, none) == 0;
}

/// As newer kernels know it; an older one takes the beginning.
struct Ruleset {
  uint64_t files;
  uint64_t network;
  uint64_t scoped;
};

/// An empty set of rules: no right on any file, port or process of others that this kernel can take.
bool CloseFileSystem() {
  const auto abi = static_cast<int>(syscall(SYS_landlock_create_ruleset, nullptr, 0, LANDLOCK_CREATE_RULESET_VERSION));
  if (abi < 1) return false;
  const int file_rights = abi >= 5 ? 16 : abi >= 3 ? 15 : abi == 2 ? 14 : 13;
  const Ruleset rules = {(1ULL << file_rights) - 1, abi >= 4 ? 3ULL : 0, abi >= 6 ? 3ULL : 0};
  const size_t size = abi >= 6 ? sizeof(rules) : abi >= 4 ? offsetof(Ruleset, scoped) : offsetof(Ruleset, network);
  const auto ruleset = static_cast<int>(syscall(SYS_landlock_create_ruleset, &rules, size, 0));
  const bool closed = ruleset >= 0 && syscall(SYS_landlock_restrict_self, ruleset, 0) == 0;
  if (ruleset >= 0) (void)close(ruleset);
  return closed;
}

/// What the C library and the readers' libraries need to compute, and to read and answer.
constexpr int kAllowed[] = {
    SCMP_SYS(read),
    SCMP_SYS(pread64),
    SCMP_SYS(readv),
    SCMP_SYS(write),
    SCMP_SYS(writev),
    SCMP_SYS(close),
    SCMP_SYS(dup),
    SCMP_SYS(lseek),
    SCMP_SYS(_llseek),
    SCMP_SYS(fstat),
    SCMP_SYS(munmap),
    SCMP_SYS(mremap),
    SCMP_SYS(brk),
    SCMP_SYS(rt_sigaction),
    SCMP_SYS(rt_sigprocmask),
    SCMP_SYS(rt_sigreturn),
    SCMP_SYS(sigreturn),
    SCMP_SYS(getpid),
    SCMP_SYS(gettid),
    SCMP_SYS(clock_gettime),
    SCMP_SYS(clock_gettime64),
    SCMP_SYS(gettimeofday),
    SCMP_SYS(getrandom),
    SCMP_SYS(sysinfo),
    SCMP_SYS(sched_getaffinity),
    SCMP_SYS(sched_yield),
    SCMP_SYS(exit),
    SCMP_SYS(exit_group),
    SCMP_SYS(restart_syscall),
};

/// A call that is allowed where an argument, as far as the mask looks at it, has this value.
struct ArgumentRule {
  int call;
  unsigned argument;
  scmp_datum_t mask;
  scmp_datum_t value;
};

constexpr scmp_datum_t kWhole = 0xFFFFFFFF;
/// Of what a futex can do, the waiting and waking of ordinary locks.
constexpr auto kFutexCommand = static_cast<scmp_datum_t>(static_cast<uint32_t>(FUTEX_CMD_MASK));

constexpr ArgumentRule kAllowedWhere[] = {
    {SCMP_SYS(mmap), 2, PROT_EXEC, 0},
    {SCMP_SYS(mmap2), 2, PROT_EXEC, 0},
    {SCMP_SYS(mprotect), 2, PROT_EXEC, 0},
    {SCMP_SYS(madvise), 2, kWhole, MADV_DONTNEED},
    {SCMP_SYS(madvise), 2, kWhole, MADV_FREE},
    // How this C library asks for the status of an open file.
    {SCMP_SYS(newfstatat), 3, AT_EMPTY_PATH, AT_EMPTY_PATH},
    // What it asks of an open file before it reads it as a stream. Not whom to signal when it changes.
    {SCMP_SYS(fcntl), 1, kWhole, F_GETFL},
    {SCMP_SYS(fcntl64), 1, kWhole, F_GETFL},
    {SCMP_SYS(fcntl), 1, kWhole, F_GETFD},
    {SCMP_SYS(fcntl64), 1, kWhole, F_GETFD},
    {SCMP_SYS(fcntl), 1, kWhole, F_SETFD},
    {SCMP_SYS(fcntl64), 1, kWhole, F_SETFD},
    {SCMP_SYS(fcntl), 1, kWhole, F_DUPFD},
    {SCMP_SYS(fcntl64), 1, kWhole, F_DUPFD},
    {SCMP_SYS(fcntl), 1, kWhole, F_DUPFD_CLOEXEC},
    {SCMP_SYS(fcntl64), 1, kWhole, F_DUPFD_CLOEXEC},
    {SCMP_SYS(futex), 1, kFutexCommand, FUTEX_WAIT},
    {SCMP_SYS(futex_time64), 1, kFutexCommand, FUTEX_WAIT},
    {SCMP_SYS(futex), 1, kFutexCommand, FUTEX_WAKE},
    {SCMP_SYS(futex_time64), 1, kFutexCommand, FUTEX_WAKE},
    {SCMP_SYS(futex), 1, kFutexCommand, FUTEX_WAIT_BITSET},
    {SCMP_SYS(futex_time64), 1, kFutexCommand, FUTEX_WAIT_BITSET},
    {SCMP_SYS(recvmsg), 0, kWhole, kWorkerSocket},
    {SCMP_SYS(setitimer), 0, kWhole, ITIMER_PROF},
};

bool Allow(scmp_filter_ctx filter, int call) { return seccomp_rule_add(filter, SCMP_ACT_ALLOW, call, 0) == 0; }

bool AllowWhere(scmp_filter_ctx filter, const ArgumentRule& rule) {
  const scmp_arg_cmp argument = {rule.argument, SCMP_CMP_MASKED_EQ, rule.mask, rule.value};
  return seccomp_rule_add_array(filter, SCMP_ACT_ALLOW, rule.call, 1, &argument) == 0;
}

bool AddRules(scmp_filter_ctx filter) {
  bool added = true;
  for (const int call : kAllowed) added = Allow(filter, call) && added;
  for (const ArgumentRule& rule : kAllowedWhere) added = AllowWhere(filter, rule) && added;
  // How a sanitizer asks whether memory is there, and where the stacks are when an exception passes.
  for (const int call : {SCMP_SYS(pipe2), SCMP_SYS(sigaltstack), SCMP_SYS(madvise)}) {
    added = (!kSanitized || Allow(filter, call)) && added;
  }
  // How a process ends itself.
  return AllowWhere(filter, {SCMP_SYS(tgkill), 0, kWhole, static_cast<scmp_datum_t>(getpid())}) && added;
}

/// A call that is not in the lists fails with EPERM. It does not kill: libraries try calls that they can do without.
bool CloseSystemCalls() {
  const std::unique_ptr<void, decltype(&seccomp_release)> filter(seccomp_init(SCMP_ACT_ERRNO(EPERM)), &seccomp_release);
  return filter != nullptr && AddRules(filter.get()) && seccomp_load(filter.get()) == 0;
}

}  // namespace

std::vector<std::string> GiveUpRights(const char* empty_folder) {
  std::vector<std::string> missing;
  const auto note = [&missing](bool given_up, const char* name) {
    if (!given_up) missing.emplace_back(name);
  };
  if (geteuid() == 0) {  // everybody else can neither change users nor the root
    note(empty_folder == nullptr || chroot(empty_folder) == 0, "an empty root");
    const bool alone = chdir("/") == 0 && setgroups(0, nullptr) == 0;
    const bool own = BecomeUser(OwnUser());
    note(own, "a user of its own");
    note(alone && (own || BecomeUser(kNobody)), "a user without rights");
  }
  note(DropCapabilities(), "no capabilities");
  (void)prctl(PR_SET_DUMPABLE, 0);
  note(prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0, "no new privileges");
  return missing;
}

std::vector<std::string> CloseSandbox() {
  std::vector<std::string> missing;
  const auto note = [&missing](bool closed, const char* name) {
    if (!closed) missing.emplace_back(name);
  };
  note(base::YieldToOthers(), "idle priority");
  note(LimitResources(), "resource limits");
  note(CloseFileSystem(), "Landlock");
  note(CloseSystemCalls(), "seccomp");
  return missing;
}

void LimitCpuTime(int limit_seconds) {
  itimerval timer = {};
  timer.it_value.tv_sec = limit_seconds;
  (void)setitimer(ITIMER_PROF, &timer, nullptr);
}

}  // namespace ferrox::extract
