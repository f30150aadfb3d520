#define FERROX_SOURCE "util"
#include <kova/service.h>

#include "fileindex/util.h"

namespace ferrox::fileindex {

namespace {

constexpr char kNotifier[] = "/usr/kova/bin/kovazemnotify";
constexpr char kApplication[] = "KOVA.Ferrox.Application";
constexpr unsigned int kNotifierOptions = 0xBB;

}  // namespace

void SendZEMNotify() {
  (void)KLIBCExecl(kNotifier, kNotifierOptions, "-c", kApplication, "-b", "true", "-e", "false", "@administrators",
                   "app:displayname", "error:index_no_space",
                   R"(<a data-kova-app="KOVA.Ferrox.Application" data-kova-fn="preference">)", "</a>",
                   static_cast<char*>(nullptr));
}

void NotifyLackOfMemory() {
  (void)KLIBCExecl(kNotifier, kNotifierOptions, "-c", kApplication, "@administrators", "app:displayname",
                   "error:lack_of_memory", static_cast<char*>(nullptr));
}

}  // namespace ferrox::fileindex
