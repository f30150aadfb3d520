// Samba's configuration as any bytes: after a switch each of its sections has the wanted value, every other value is as
// it was, and there is nothing left to switch. The same bytes as testparm's output give shares that may stand in the
// table. The first byte chooses on or off.

#include <cstdint>
#include <cstdlib>
#include <set>
#include <string>
#include <vector>

#include "platform/host/samba_files.h"
#include "platform/host/samba_shares.h"
#include "platform/host/share_rules.h"
#include "platform/host/smb_conf.h"

using kova::host::SmbConf;

namespace {

constexpr char kSpotlight[] = "spotlight";

void Require(bool condition) {
  if (!condition) abort();
}

void CheckSwitch(const SmbConf& conf, bool on) {
  std::vector<std::string> sections;
  for (const std::string& section : conf.Sections()) {
    if (!kova::host::IsSpecialSection(section)) sections.push_back(section);
  }
  const SmbConf changed(conf.WithSwitch(sections, kSpotlight, on));
  Require(changed.Sections() == conf.Sections());
  for (const std::string& section : sections) {
    Require(changed.IsOn(section, kSpotlight) == on);
    for (const char* other : {"path", "include", "vfs objects", "comment"}) {
      Require(changed.Get(section, other) == conf.Get(section, other));
    }
  }
  Require(changed.Get("global", kSpotlight) == conf.Get("global", kSpotlight));
  Require(changed.WithSwitch(sections, kSpotlight, on) == changed.Text());
  Require(conf.WithSwitch({}, kSpotlight, on) == conf.Text());
}

void CheckShares(const std::string& output) {
  std::vector<std::string> problems;
  std::set<std::string> names;
  for (const kova::host::ShareEntry& share : kova::host::ParseTestparm(output, problems)) {
    Require(kova::host::ShareTextProblem(share.name, share.path).empty());
    Require(share.recycle.find('/') == std::string::npos);
    Require(names.insert(share.name).second);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const std::string text(reinterpret_cast<const char*>(data) + 1, size - 1);
  CheckSwitch(SmbConf(text), (data[0] & 1) != 0);
  CheckShares(text);
  return 0;
}
