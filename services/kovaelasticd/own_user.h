#pragma once

#include <string>

/// The engine as a user of its own (services/support/engine_user.h).
namespace ferrox::engine {

/// As root, in an instance of root's: makes what the engine needs of others' folders (its pid file, its runtime folder
/// and the link by which clients find its socket there), gives the user the list of indices and the indices, with all
/// files that root made, and lets it ask the daemons that run. Can be repeated; stopped at any moment, the next call
/// goes on.
///
/// Gives nothing away that others could have put in place: no link is followed, each folder on the way must be root's
/// and such that nobody else can change it, a file must be root's and have no other name, and a folder goes after what
/// is in it, while it is still root's. What a folder of the user's holds is left as it is, but for folders of root's in
/// the one for all indices, which an engine that root started has made.
/// @param user the name of an account, or a number, also as its group where there is no account
/// @throws Error kInternal with a sentence.
void PrepareForUser(const std::string& user);

/// As root, where the engine has a user of its own: prepares, and becomes that user, without a capability. Does nothing
/// for anybody else. Called before there is a thread. @throws Error kInternal.
void BecomeOwnUser();

/// Where this process is to take requests.
std::string OwnSocketPath();

}  // namespace ferrox::engine
