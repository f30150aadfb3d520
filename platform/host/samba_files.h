#pragma once

#include <string>
#include <vector>

#include "platform/host/smb_conf.h"

/// Samba's configuration: its files and its sections.
namespace kova::host {

/// Whether a section is no share of files, or each user's own: global, homes, printers, print$ and ipc$.
bool IsSpecialSection(const std::string& section);

struct IncludedFile {
  std::string path;
  SmbConf conf;
};

/// The files that `conf` includes, and those that they include, as far as they can be read. Paths in which Samba
/// replaces something ("%m") are left out: which file is meant differs from client to client.
std::vector<IncludedFile> ReadIncludedFiles(const SmbConf& conf);

}  // namespace kova::host
