#pragma once

#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <deque>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "base/mutex.h"
#include "base/thread_annotations.h"
#include "base/unique_fd.h"
#include "services/kovanotifyd/cookie.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// A watcher that says what a test tells it to, from any thread, and covers at once unless it is to hold that back.
class FakeWatcher : public Watcher {
 public:
  using Action = std::function<void(WatchListener&)>;

  explicit FakeWatcher(const std::string& cookie_path = {}) {
    epoll_event event = {EPOLLIN, {}};
    (void)epoll_ctl(epoll_.Get(), EPOLL_CTL_ADD, wake_.Get(), &event);
    (void)epoll_ctl(epoll_.Get(), EPOLL_CTL_ADD, cookie_.Get(), &event);
    if (!cookie_path.empty()) (void)inotify_add_watch(cookie_.Get(), cookie_path.c_str(), IN_ATTRIB);
  }

  /// Reported by the next Read.
  void Say(Action action) {
    const base::MutexLock lock(mutex_);
    said_.push_back(std::move(action));
    (void)eventfd_write(wake_.Get(), 1);
  }
  void Say(const Change& change) {
    Say([change](WatchListener& listener) { listener.OnChange(change); });
  }
  void Refuse(const std::string& reason) { Set(&FakeWatcher::refusal_, reason); }
  /// Roots below this path are not covered; "" for none.
  void Hold(const std::string& path) { Set(&FakeWatcher::held_path_, path); }
  void HoldCookies(bool hold) { Set(&FakeWatcher::holds_cookies_, hold); }
  int Touches() const { return Get(&FakeWatcher::touches_); }
  /// "+path" and "-path" for each root added and removed.
  std::string Calls() const { return Get(&FakeWatcher::calls_); }

  const char* Name() const override { return "fake"; }
  void Add(const WatchRoot& root) override {
    const base::MutexLock lock(mutex_);
    calls_ += "+" + root.path + " ";
    fresh_[root.path] = true;
  }
  void Remove(const std::string& root) override {
    const base::MutexLock lock(mutex_);
    calls_ += "-" + root + " ";
    fresh_.erase(root);
  }
  int Fd() const override { return epoll_.Get(); }
  bool Read(WatchListener& listener) override {
    for (const Action& action : TakeSaid()) action(listener);
    return false;
  }
  bool Advance(std::chrono::milliseconds, WatchListener& listener) override {
    std::vector<std::string> due;
    const std::string refusal = Get(&FakeWatcher::refusal_);
    {
      const base::MutexLock lock(mutex_);
      for (const auto& [path, is_fresh] : fresh_) {
        if (held_path_.empty() || path.compare(0, held_path_.size(), held_path_) != 0) due.push_back(path);
      }
      for (const std::string& path : due) fresh_.erase(path);
    }
    for (const std::string& path : due) {
      refusal.empty() ? listener.OnCovered(path) : listener.OnRefused(path, refusal);
    }
    return false;
  }
  uint64_t Watches(const std::string&) const override { return 7; }

 private:
  template <typename Value>
  void Set(Value FakeWatcher::*member, const Value& value) {
    const base::MutexLock lock(mutex_);
    this->*member = value;
    (void)eventfd_write(wake_.Get(), 1);
  }
  template <typename Value>
  Value Get(Value FakeWatcher::*member) const {
    const base::MutexLock lock(mutex_);
    return this->*member;
  }

  std::deque<Action> TakeSaid() {
    const base::MutexLock lock(mutex_);
    eventfd_t count = 0;
    (void)eventfd_read(wake_.Get(), &count);
    char events[1024];
    while (read(cookie_.Get(), events, sizeof(events)) > 0) {
      ++touches_;
      is_cookie_due_ = true;
    }
    std::deque<Action> said = std::exchange(said_, {});
    if (is_cookie_due_ && !holds_cookies_) {
      is_cookie_due_ = false;
      said.push_back([](WatchListener& listener) { listener.OnCookie(); });
    }
    return said;
  }

  base::UniqueFd epoll_{epoll_create1(EPOLL_CLOEXEC)};
  base::UniqueFd wake_{eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)};
  base::UniqueFd cookie_{inotify_init1(IN_CLOEXEC | IN_NONBLOCK)};
  mutable base::Mutex mutex_;
  std::deque<Action> said_ BASE_GUARDED_BY(mutex_);
  std::string refusal_ BASE_GUARDED_BY(mutex_);
  std::string held_path_ BASE_GUARDED_BY(mutex_);
  std::string calls_ BASE_GUARDED_BY(mutex_);
  std::map<std::string, bool> fresh_ BASE_GUARDED_BY(mutex_);
  bool holds_cookies_ BASE_GUARDED_BY(mutex_) = false;
  bool is_cookie_due_ BASE_GUARDED_BY(mutex_) = false;
  int touches_ BASE_GUARDED_BY(mutex_) = 0;
};

}  // namespace ferrox::notifyd
