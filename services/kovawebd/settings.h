#pragma once

#include <functional>
#include <string>
#include <vector>

namespace ferrox::web {

/// What the settings say of the web daemon (docs/http.md).
struct Settings {
  std::vector<std::string> addresses;  ///< where it listens, "127.0.0.1:9280", "[::1]:0"; port 0: any that is free
  std::vector<std::string> hosts;      ///< by which names it may be asked, without a port
};
/// Where the tokens are; the folder is made where it is missing.
std::string TokensPath();

using ReadSettings = std::function<Settings()>;

/// As root, in an instance of root's: makes what the daemon needs of others' folders (its pid file, the folders of its
/// socket and of its tokens), gives it to `user` (an account or a number), and tells it of the settings. That makes the
/// user the daemon's, and one that may ask the engine for others. Can be repeated. @throws Error kInternal.
void PrepareForUser(const std::string& user, const Settings& settings);

/// As root, where the daemon has a user of its own: prepares, and becomes that user. Called before there is a thread.
/// @return the settings, by `read` where this process may read them itself. @throws Error kInternal; what `read`
/// throws.
Settings BecomeOwnUser(const ReadSettings& read);

}  // namespace ferrox::web
