#include "tests/contract/in_child.h"

#include <sched.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <iterator>
#include <string>

#include <gtest/gtest.h>

#include "tests/support/temp_dir.h"

namespace ferrox::test {

bool InChild(bool privately, const std::function<void()>& body) {
  const std::filesystem::directory_iterator threads("/proc/self/task");
  EXPECT_EQ(1, std::distance(begin(threads), end(threads))) << "a child would have the locks that other threads hold";
  const uid_t uid = geteuid();
  const gid_t gid = getegid();
  const pid_t child = fork();
  if (child == 0) {
    if (privately && unshare(CLONE_NEWNS | (uid != 0 ? CLONE_NEWUSER : 0)) != 0) _exit(77);
    if (privately && uid != 0) {
      WriteFile("/proc/self/setgroups", "deny");
      WriteFile("/proc/self/uid_map", "0 " + std::to_string(uid) + " 1");
      WriteFile("/proc/self/gid_map", "0 " + std::to_string(gid) + " 1");
    }
    if (privately && mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) _exit(77);
    body();
    _exit(testing::Test::HasFailure() ? 1 : 0);
  }
  int status = 0;
  (void)waitpid(child, &status, 0);
  if (WIFEXITED(status) && WEXITSTATUS(status) == 77) return false;
  EXPECT_EQ(0, status) << "see the failures above";
  return true;
}

}  // namespace ferrox::test
