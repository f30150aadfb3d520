#include "services/kovacontentextractd/sandbox.h"

#include <fcntl.h>
#include <grp.h>
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

namespace ferrox::extract {

namespace {

constexpr uid_t kNobody = 65534;
constexpr int kNiceness = 10;
constexpr rlim_t kCpuSecondsPerProcess = 3600;
constexpr rlim_t kFilesMax = 16;  // the three usual ones, the daemon's socket, the file, and copies of it

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

/// Whoever may change users becomes nobody, below an empty root. Everybody else has nothing to give up.
bool BecomeNobody(const char* empty_folder) {
  if (geteuid() != 0) return true;
  const bool rooted = empty_folder == nullptr || chroot(empty_folder) == 0;
  return chdir("/") == 0 && setgroups(0, nullptr) == 0 && setresgid(kNobody, kNobody, kNobody) == 0 &&
         setresuid(kNobody, kNobody, kNobody) == 0 && rooted;
}

bool YieldToOthers() {
  constexpr int kWhoProcess = 1, kIdleClass = 3, kClassShift = 13;
  const bool disk = syscall(SYS_ioprio_set, kWhoProcess, 0, kIdleClass << kClassShift) == 0;
  return setpriority(PRIO_PROCESS, 0, kNiceness) == 0 && disk;
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
    SCMP_SYS(recvmsg),
    SCMP_SYS(close),
    SCMP_SYS(dup),
    SCMP_SYS(lseek),
    SCMP_SYS(_llseek),
    SCMP_SYS(fstat),
    SCMP_SYS(fstat64),
    SCMP_SYS(fcntl),
    SCMP_SYS(fcntl64),
    SCMP_SYS(munmap),
    SCMP_SYS(mremap),
    SCMP_SYS(brk),
    SCMP_SYS(madvise),
    SCMP_SYS(futex),
    SCMP_SYS(futex_time64),
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
    SCMP_SYS(setitimer),
    SCMP_SYS(exit),
    SCMP_SYS(exit_group),
    SCMP_SYS(restart_syscall),
};

bool Allow(scmp_filter_ctx filter, int call) { return seccomp_rule_add(filter, SCMP_ACT_ALLOW, call, 0) == 0; }

bool AllowWhere(scmp_filter_ctx filter, int call, const scmp_arg_cmp& argument) {
  return seccomp_rule_add_array(filter, SCMP_ACT_ALLOW, call, 1, &argument) == 0;
}

bool AddRules(scmp_filter_ctx filter) {
  bool added = true;
  for (const int call : kAllowed) added = Allow(filter, call) && added;
  // How a sanitizer asks whether memory is there, and where the stacks are when an exception passes.
  for (const int call : {SCMP_SYS(pipe2), SCMP_SYS(sigaltstack)}) added = (!kSanitized || Allow(filter, call)) && added;
  const scmp_arg_cmp not_executable = SCMP_A2(SCMP_CMP_MASKED_EQ, PROT_EXEC, 0);
  for (const int call : {SCMP_SYS(mmap), SCMP_SYS(mmap2), SCMP_SYS(mprotect)}) {
    added = AllowWhere(filter, call, not_executable) && added;
  }
  // How this C library asks for the status of an open file.
  added = AllowWhere(filter, SCMP_SYS(newfstatat), SCMP_A3(SCMP_CMP_MASKED_EQ, AT_EMPTY_PATH, AT_EMPTY_PATH)) && added;
  // How a process ends itself.
  const scmp_arg_cmp itself = {0, SCMP_CMP_EQ, static_cast<scmp_datum_t>(getpid()), 0};
  return AllowWhere(filter, SCMP_SYS(tgkill), itself) && added;
}

bool CloseSystemCalls() {
  const std::unique_ptr<void, decltype(&seccomp_release)> filter(seccomp_init(SCMP_ACT_ERRNO(EPERM)), &seccomp_release);
  return filter != nullptr && AddRules(filter.get()) && seccomp_load(filter.get()) == 0;
}

}  // namespace

std::vector<std::string> CloseSandbox(const char* empty_folder) {
  std::vector<std::string> missing;
  const auto note = [&missing](bool closed, const char* name) {
    if (!closed) missing.emplace_back(name);
  };
  note(YieldToOthers(), "idle priority");
  note(BecomeNobody(empty_folder), "a user without rights");
  (void)prctl(PR_SET_DUMPABLE, 0);
  note(LimitResources(), "resource limits");
  note(prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0, "no new privileges");
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
