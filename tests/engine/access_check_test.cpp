// Catches rights that the engine reads otherwise than the kernel does: random records are given to real files and
// folders, and random users open them.
#include "services/kovaelasticd/store/access_check.h"

#include <fcntl.h>
#include <grp.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <random>
#include <set>

#include <gtest/gtest.h>

#include "base/unique_fd.h"
#include "tests/support/temp_dir.h"

namespace ferrox::engine {
namespace {

constexpr uint32_t kIds = 50001;  ///< users and groups are this and the next few: of no account
constexpr size_t kFiles = 250, kAskers = 24;

class RandomRights {
 public:
  uint32_t Id() { return kIds + random_() % 4; }
  base::AccessRecord Record() {
    base::AccessRecord record;
    record.uid = Id();
    record.gid = Id();
    record.mode = static_cast<uint16_t>(random_() % 01000);
    if (random_() % 4 == 0) record.mode &= 0707;
    if (random_() % 3 == 0) return record;
    std::set<uint32_t> users, groups;
    for (size_t i = random_() % 3; i > 0; --i) users.insert(Id());
    for (size_t i = random_() % 4; i > 0; --i) groups.insert(Id());
    for (const uint32_t id : users) record.acl.push_back({base::AclEntry::Kind::kUser, Bits(), id});
    record.acl.push_back({base::AclEntry::Kind::kOwningGroup, Bits(), 0});
    for (const uint32_t id : groups) record.acl.push_back({base::AclEntry::Kind::kGroup, Bits(), id});
    return record;
  }
  Asker User() {
    std::set<uint32_t> groups = {Id()};
    for (size_t i = random_() % 3; i > 0; --i) groups.insert(Id());
    return {Id(), {groups.begin(), groups.end()}, "/"};
  }

 private:
  uint8_t Bits() { return static_cast<uint8_t>(random_() % 8); }
  std::mt19937 random_{20261122};
};

/// The attribute that an ACL is set by.
std::string AclAttribute(const base::AccessRecord& record) {
  std::string bytes("\2\0\0\0", 4);
  const auto add = [&bytes](uint16_t tag, unsigned permissions, uint32_t id = UINT32_MAX) {
    const auto allowed = static_cast<uint16_t>(permissions & 7);
    bytes.append(reinterpret_cast<const char*>(&tag), 2).append(reinterpret_cast<const char*>(&allowed), 2);
    bytes.append(reinterpret_cast<const char*>(&id), 4);
  };
  add(0x01, record.mode >> 6U);
  for (const base::AclEntry& entry : record.acl) {
    if (entry.kind == base::AclEntry::Kind::kOwningGroup) {
      add(0x04, entry.permissions);
    } else {
      add(entry.kind == base::AclEntry::Kind::kUser ? 0x02 : 0x08, entry.permissions, entry.id);
    }
  }
  add(0x10, record.mode >> 3U);
  add(0x20, record.mode);
  return bytes;
}

/// What the kernel gives the caller.
uint8_t TryAll(const std::string& path) {
  const base::UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  struct stat status = {};
  const bool enters = stat((path + "/none").c_str(), &status) == 0 || errno == ENOENT;
  return static_cast<uint8_t>((file.Get() >= 0 ? kMayRead : 0) | (enters ? kMayEnter : 0));
}

/// The same for `asker`, of all `paths`; "" when this process cannot become them.
std::string TryAs(const Asker& asker, const std::vector<std::string>& paths) {
  int ends[2];
  if (pipe(ends) != 0) return "";
  const pid_t child = fork();
  if (child == 0) {
    std::string seen;
    const bool is_them = setgroups(asker.groups.size() - 1, asker.groups.data() + 1) == 0 &&
                         setresgid(asker.groups[0], asker.groups[0], asker.groups[0]) == 0 &&
                         setresuid(asker.uid, asker.uid, asker.uid) == 0;
    for (size_t i = 0; is_them && i < paths.size(); ++i) seen += static_cast<char>(TryAll(paths[i]));
    (void)!write(ends[1], seen.data(), seen.size());
    _exit(0);
  }
  (void)close(ends[1]);
  std::string seen(paths.size() + 1, '\0');
  const ssize_t size = read(ends[0], seen.data(), seen.size());
  (void)close(ends[0]);
  EXPECT_EQ(child, waitpid(child, nullptr, 0));
  seen.resize(size < 0 ? 0 : static_cast<size_t>(size));
  return seen;
}

TEST(AccessCheckTest, GivesWhatTheKernelGives) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can give files away";
  const test::TempDir dir;
  ASSERT_EQ(0, chmod(dir.Path().c_str(), 0755));
  RandomRights random;
  std::vector<std::string> paths;
  std::vector<base::AccessRecord> records;
  for (size_t i = 0; i < kFiles; ++i) {
    const std::string& path = paths.emplace_back(dir / std::to_string(i));
    const base::AccessRecord& record = records.emplace_back(random.Record());
    ASSERT_EQ(0, i % 2 == 0 ? mkdir(path.c_str(), 0700) : mknod(path.c_str(), S_IFREG | 0600, 0));
    ASSERT_EQ(0, chown(path.c_str(), record.uid, record.gid));
    ASSERT_EQ(0, chmod(path.c_str(), record.mode));
    if (record.acl.empty()) continue;
    const std::string acl = AclAttribute(record);
    if (setxattr(path.c_str(), "system.posix_acl_access", acl.data(), acl.size(), 0) != 0) {
      GTEST_SKIP() << "no ACLs here: " << strerror(errno);
    }
  }
  size_t granted = 0;
  for (size_t user = 0; user < kAskers; ++user) {
    const Asker asker = random.User();
    const std::string seen = TryAs(asker, paths);
    if (seen.empty()) GTEST_SKIP() << "this process cannot take on other ids";
    ASSERT_EQ(kFiles, seen.size());
    for (size_t i = 0; i < kFiles; ++i) {
      const uint8_t asked = i % 2 == 0 ? kMayRead | kMayEnter : kMayRead;  // only a folder can be entered
      ASSERT_EQ(seen[i], PermissionsOf(records[i], asker) & asked)
          << base::AccessText(records[i]) << " uid " << asker.uid << " groups " << testing::PrintToString(asker.groups);
      granted += seen[i] != 0 ? 1 : 0;
    }
  }
  EXPECT_GT(granted, kFiles * kAskers / 4);
  EXPECT_LT(granted, kFiles * kAskers * 3 / 4);
}

}  // namespace
}  // namespace ferrox::engine
