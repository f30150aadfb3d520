#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include <kova/samba.h>

#include "platform/host/configuration.h"
#include "platform/host/files.h"
#include "platform/host/log.h"
#include "platform/host/run_program.h"
#include "platform/host/samba_files.h"
#include "platform/host/share_table.h"
#include "platform/host/smb_conf.h"
#include "platform/host/stat_cache.h"
#include "platform/shared/failure.h"

using kova::host::LogChange;
using kova::host::SmbConf;

namespace {

constexpr char kSpotlight[] = "spotlight";

/// Samba's configuration, and the sections in it of the shares that this host has.
struct Reading {
  std::string path;  ///< of the file itself, where the configured one is a link
  struct stat info = {};
  std::unique_ptr<SmbConf> conf;
  std::vector<std::string> sections;
  std::vector<std::string> elsewhere;  ///< shares that have no section there
};

void Sort(const std::string& share, Reading& reading) {
  if (kova::host::IsSpecialSection(share)) return;
  (reading.conf->HasSection(share) ? reading.sections : reading.elsewhere).push_back(share);
}

int Refuse(int code, const std::string& path, const std::string& sentence) {
  LogChange(code == KOVA_ERR_NOT_SUPPORTED ? LOG_INFO : LOG_ERR, path, sentence);
  return KOVA_FAIL(code);
}

/// 0, or below 0 with the failure recorded and its reason logged, once as long as it stays the same.
int Read(Reading& reading) {
  const auto configuration = kova::host::GetConfiguration();
  const auto table = kova::host::ShareTable::Current();
  if (table == nullptr) return -1;
  if (!configuration->problem.empty()) return KOVA_FAIL(KOVA_ERR_BAD_CONFIGURATION);
  const std::string& given = configuration->samba.config;
  char resolved[PATH_MAX];
  reading.path = realpath(given.c_str(), resolved) != nullptr ? resolved : given;
  std::string text;
  const std::string problem = kova::host::ReadTextFile(reading.path, text, &reading.info);
  if (!problem.empty()) {
    return Refuse(KOVA_ERR_BAD_CONFIGURATION, given, "Samba's configuration " + given + " " + problem);
  }
  if (reading.info.st_ino == 0) {
    return Refuse(KOVA_ERR_NOT_SUPPORTED, given,
                  "there is no Samba configuration " + given + ": Spotlight is not switched");
  }
  reading.conf = std::make_unique<SmbConf>(std::move(text));
  for (const kova::host::ShareEntry& share : table->Entries()) Sort(share.name, reading);
  return 0;
}

/// Logs each share whose section is in an included file: that is not ours to change, so people set the switch there.
void LogIncludedSwitches(const Reading& reading) {
  if (reading.elsewhere.empty()) return;
  for (const kova::host::IncludedFile& file : kova::host::ReadIncludedFiles(*reading.conf)) {
    for (const std::string& share : reading.elsewhere) {
      if (!file.conf.HasSection(share)) continue;
      LogChange(LOG_WARNING, file.path + " " + share,
                "the section of share \"" + share + "\" is in " + file.path + ", which " + reading.path +
                    " includes: set \"spotlight\" there by hand");
    }
  }
}

/// A running search worker keeps what it has read; it is ended, and begins anew at the next search.
void EndSearchWorker(const std::string& config) {
  const std::string program = kova::host::GetConfiguration()->samba.smbcontrol;
  if (program.empty() || access(program.c_str(), X_OK) != 0) return;
  std::string output;
  if (kova::host::RunForOutput(program, {"-s", config, "samba-dcerpcd", "shutdown"}, output) == 0) return;
  LogChange(LOG_INFO, program,
            program +
                " samba-dcerpcd shutdown failed, as it does when no search worker runs; one that runs keeps the "
                "old Spotlight setting until it ends");
}

bool IsUnchanged(const Reading& reading) {
  struct stat now = {};
  return stat(reading.path.c_str(), &now) == 0 && kova::host::SameFile(now, reading.info);
}

}  // namespace

int KOVASMBIsEnableSpotlight(void) {
  Reading reading;
  if (Read(reading) < 0) return 0;
  const bool all = std::all_of(reading.sections.begin(), reading.sections.end(),
                               [&](const std::string& section) { return reading.conf->IsOn(section, kSpotlight); });
  return all && !reading.sections.empty() ? 1 : 0;
}

int KOVASMBSetSpotlight(int enable) {
  Reading reading;
  if (Read(reading) < 0) return -1;
  LogIncludedSwitches(reading);
  if (reading.sections.empty()) {
    return Refuse(KOVA_ERR_NOT_SUPPORTED, reading.path,
                  "no share stands in " + reading.path + ": Spotlight is not switched");
  }
  const std::string text = reading.conf->WithSwitch(reading.sections, kSpotlight, enable != 0);
  if (text == reading.conf->Text()) return 0;
  if (!IsUnchanged(reading)) {
    return Refuse(KOVA_ERR_SYSTEM, reading.path, reading.path + " was being changed: Spotlight is not switched");
  }
  if (!kova::host::ReplaceFile(reading.path, text, reading.info)) {
    const int code = kova::SystemFailureCode();
    return Refuse(code, reading.path, "cannot write " + reading.path + ": " + strerror(errno));
  }
  LogChange(LOG_NOTICE, reading.path,
            std::string("Spotlight is switched ") + (enable != 0 ? "on" : "off") + " in " + reading.path);
  EndSearchWorker(reading.path);
  return 0;
}
