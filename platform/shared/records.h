#pragma once

#include <string>

#include <kova/share.h>
#include <kova/user.h>

/// The records that the C interface hands out: each with copies of its texts, owned by the caller, who frees it by
/// KOVAShareFree or KOVAUserFree.
namespace kova {

KOVAShare* NewShare(const std::string& name, const std::string& path, uint32_t ftp_privilege, uint32_t flags);
KOVAUser* NewUser(const std::string& name, uint32_t uid, uint32_t gid, const std::string& home);
/// How many records the process has not freed yet, so that tests find those that are lost.
int LiveRecords();

/// Copies a text into a caller's buffer; false, with the failure recorded, when it does not fit.
bool CopyOut(const std::string& text, char* buffer, size_t size);

}  // namespace kova
