#include "tests/support/fake_platform.h"

#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <mutex>

#include "platform/shared/failure.h"

namespace ferrox::test {

namespace {

std::atomic<bool> g_ready{false};
std::mutex g_calls_mutex;

}  // namespace

FakePlatform& FakePlatform::Get() {
  static FakePlatform* platform = [] {
    auto* made = new FakePlatform;  // never freed: threads may still call at exit
    made->Reset();
    g_ready = true;
    return made;
  }();
  return *platform;
}

void FakePlatform::Reset() {
  *this = FakePlatform();
  uid_t real = 0, effective = 0, saved = 0;
  gid_t real_group = 0, effective_group = 0, saved_group = 0;
  (void)getresuid(&real, &effective, &saved);
  (void)getresgid(&real_group, &effective_group, &saved_group);
  euid = effective;
  egid = effective_group;
  users["root"] = {0, 0, true, "/root", 0};
  if (euid != 0) users["owner"] = {euid, egid, false, "/home/owner", 0};
}

bool FakePlatform::Called(const std::string& call) const {
  return std::find(calls.begin(), calls.end(), call) != calls.end();
}

int FakePlatform::CallCount(const std::string& function) const {
  return static_cast<int>(std::count_if(calls.begin(), calls.end(), [&](const std::string& call) {
    return call.compare(0, function.size() + 1, function + "(") == 0;
  }));
}

bool FakeCallFails(const char* function, const std::string& arguments) {
  FakePlatform& platform = FakePlatform::Get();
  const std::string call = std::string(function) + "(" + arguments + ")";
  if (platform.on_call) platform.on_call(call);
  const std::lock_guard<std::mutex> guard(g_calls_mutex);
  platform.calls.push_back(call);
  const auto found = platform.failing.find(function);
  if (found == platform.failing.end()) return false;
  FakeFailure& failure = found->second;
  if (failure.skip > 0) {
    --failure.skip;
    return false;
  }
  if (failure.times == 0) return false;
  if (failure.times > 0) --failure.times;
  (void)kova::SetFailure(failure.code, "fake_platform.cpp", 1);
  return true;
}

}  // namespace ferrox::test

// The identity that the code under test sees, in place of the C library's. Sanitizers ask before main.
extern "C" uid_t geteuid() noexcept {
  uid_t real = 0, effective = 0, saved = 0;
  if (ferrox::test::g_ready) return ferrox::test::FakePlatform::Get().euid;
  (void)getresuid(&real, &effective, &saved);
  return effective;
}

extern "C" gid_t getegid() noexcept {
  gid_t real = 0, effective = 0, saved = 0;
  if (ferrox::test::g_ready) return ferrox::test::FakePlatform::Get().egid;
  (void)getresgid(&real, &effective, &saved);
  return effective;
}
