// Stands in for a daemon in the tests of services: takes its pid file, serves its socket when it has one, and ends when
// told. It is run under the daemon's own name. The file "helper_mode" in the instance's root may say "die".

#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

namespace {

int CountDescriptors() {
  int count = 0;
  DIR* folder = opendir("/proc/self/fd");
  while (folder != nullptr && readdir(folder) != nullptr) ++count;
  if (folder != nullptr) (void)closedir(folder);
  return count - 3;  // ".", ".." and the folder's own
}

void Listen(const std::string& path) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  (void)snprintf(address.sun_path, sizeof(address.sun_path), "%s", path.c_str());
  const int fd = socket(AF_UNIX, SOCK_STREAM, 0);
  (void)usleep(100000);  // a starter must not take the process for the service
  (void)unlink(path.c_str());
  if (bind(fd, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0 || listen(fd, 8) != 0) _exit(4);
}

}  // namespace

int main(int, char** argv) {
  const char* root_value = getenv("FERROX_ROOT");
  const std::string root = root_value != nullptr ? root_value : "";
  const std::string name = strrchr(argv[0], '/') + 1;
  printf("started sid=%d descriptors=%d sigpipe=%s\n", getsid(0) != getpid() && getsid(0) > 0, CountDescriptors(),
         signal(SIGPIPE, SIG_IGN) == SIG_DFL ? "default" : "kept");
  (void)fflush(stdout);
  if (access((root + "/helper_mode").c_str(), F_OK) == 0) {
    fprintf(stderr, "the index is on fire\n");
    return 3;
  }
  sigset_t set;
  (void)sigemptyset(&set);
  (void)sigaddset(&set, SIGTERM);
  (void)sigprocmask(SIG_BLOCK, &set, nullptr);
  const int pid_file = open((root + "/var/run/" + name + ".pid").c_str(), O_RDWR | O_CREAT, 0644);
  if (flock(pid_file, LOCK_EX | LOCK_NB) != 0 || ftruncate(pid_file, 0) != 0) return 5;
  (void)dprintf(pid_file, "%d\n", getpid());
  if (name == "kovaelasticd") Listen(root + "/var/run/kovaelasticd.sock");
  int got = 0;
  (void)sigwait(&set, &got);
  return 0;
}
