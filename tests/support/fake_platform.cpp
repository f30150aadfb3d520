#include "tests/support/fake_platform.h"

#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <mutex>

#include "platform/base/failure.h"

namespace ferrox::test {

namespace {

std::atomic<bool> g_ready{false};
std::mutex g_calls_mutex;

uint32_t Effective(int (*get)(uint32_t*, uint32_t*, uint32_t*)) {
  uint32_t real = 0, effective = 0, saved = 0;
  (void)get(&real, &effective, &saved);
  return effective;
}

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
  euid = Effective(&getresuid);
  egid = Effective(&getresgid);
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

bool FakePlatform::Fails(const std::string& function, const std::string& call) {
  if (on_call) on_call(call);
  const std::lock_guard<std::mutex> guard(g_calls_mutex);
  calls.push_back(call);
  const auto found = failing.find(function);
  if (found == failing.end()) return false;
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
  return ferrox::test::g_ready ? ferrox::test::FakePlatform::Get().euid : ferrox::test::Effective(&getresuid);
}
extern "C" gid_t getegid() noexcept {
  return ferrox::test::g_ready ? ferrox::test::FakePlatform::Get().egid : ferrox::test::Effective(&getresgid);
}
