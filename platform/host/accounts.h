#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

/// Users and groups by the name service switch: the host's files, a domain, a directory. A call may block for as long
/// as a server on the network does. May be called by several threads at once.
namespace kova::host {

struct Account {
  std::string name;
  uid_t uid = 0;
  gid_t gid = 0;
  std::string home;
};

/// Look an account up; false, with the failure recorded, when there is none or the name service fails.
bool FindAccount(const std::string& name, Account& account);
bool FindAccount(uid_t uid, Account& account);

/// The account's groups, the primary one among them.
std::vector<gid_t> GroupsOf(const Account& account);

/// The id of a group; false when there is none.
bool FindGroup(const std::string& name, gid_t& gid);

}  // namespace kova::host
