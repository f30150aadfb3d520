#include "platform/host/exclusion_settings.h"

#include <memory>

#include "platform/host/configuration.h"

namespace kova::host {

const base::PatternLists& DefaultExclusions() {
  static const base::PatternLists defaults = {
      {
          // What programs keep for themselves beside a project's files, and can make again.
          ".git",
          ".svn",
          ".hg",
          ".bzr",
          ".jj",
          "node_modules/",
          "bower_components/",
          "__pycache__/",
          "*.pyc",
          ".cache/",
          ".venv/",
          ".tox/",
          ".nox/",
          ".mypy_cache/",
          ".pytest_cache/",
          ".ruff_cache/",
          ".ipynb_checkpoints/",
          ".gradle/",
          ".terraform/",
          ".next/",
          ".nuxt/",
          ".parcel-cache/",
          ".sass-cache/",
          ".ccache/",
          "CMakeFiles/",
          // What file servers, desktops and file systems leave.
          "@eaDir/",
          "lost+found/",
          ".Trash-*/",
          ".Trashes/",
          ".AppleDouble/",
          ".DS_Store",
          "._*",
          ".Spotlight-V100/",
          ".fseventsd/",
          ".TemporaryItems/",
          ".DocumentRevisions-V100/",
          "$RECYCLE.BIN/",
          "System Volume Information/",
          "[Tt]humbs.db",
          "ehthumbs.db",
          ".fuse_hidden*",
          ".nfs[0-9a-f]*",
          // Of a document that is open, and of one that is still being fetched.
          "~$*",
          ".~lock.*#",
          "~*.tmp",
          ".*.sw[op]",
          "*.crdownload",
      },
      {
          ".env",          ".env.*",         "id_rsa",     "id_dsa",       "id_ecdsa",      "id_ed25519",
          "id_ecdsa_sk",   "id_ed25519_sk",  "*.pem",      "*.key",        "*.p12",         "*.pfx",
          "*.jks",         "*.keystore",     "*.ppk",      "*.ovpn",       "*.kdb",         "*.kdbx",
          ".netrc",        "_netrc",         ".pgpass",    ".my.cnf",      ".htpasswd",     ".git-credentials",
          ".npmrc",        ".pypirc",        ".dockercfg", ".vault-token", ".bash_history", ".zsh_history",
          ".psql_history", ".mysql_history", ".ssh/",      ".gnupg/",      ".aws/",         ".kube/",
          ".docker/",
      },
  };
  return defaults;
}

std::string InstanceExclusions(std::vector<std::pair<std::string, base::PatternLists>>& found) {
  const std::shared_ptr<const Configuration> configuration = GetConfiguration();
  if (!configuration->problem.empty()) {
    return "which files are left out is not known: the file " + ConfigurationPath() + " " + configuration->problem;
  }
  found.clear();
  if (configuration->exclusions.defaults) found.emplace_back("default", DefaultExclusions());
  if (!configuration->exclusions.lists.Empty())
    found.emplace_back(ConfigurationPath(), configuration->exclusions.lists);
  return "";
}

}  // namespace kova::host
