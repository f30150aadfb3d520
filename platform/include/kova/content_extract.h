#pragma once

#include <sys/stat.h>

#include <string>

#include <json/forwards.h>

namespace KOVA::CONTENT_EXTRACT {

/// Fills `document` with the metadata fields of the file or folder at `path` (absolute): always the fields known from
/// the path and from `lstat` (path, parent, name, display name, kind, extension, is-directory, sizes, dates, owner,
/// content type), and, when `config["need_meta"]` is true, what the content tells (text, title, encoding).
/// Values have the types of the index schema; a field that is not known is absent.
///
/// Members beside the schema's: "_KOVAStamp" (string; changes when size, mtime, ctime or inode does) and "_KOVAAccess"
/// (string; as Access gives it) always; when the content was wanted, and of anything but a folder, "_KOVANeedMeta"
/// (true), "_KOVAExtractError" (string; the reason) where it, or a part of it, could not be read, "_KOVATextEncoding"
/// (string; " (guess)" at its end when the text was too short to tell), where there was more text than is kept
/// "_KOVATextCut" (true), and where a reader was asked "_KOVAExtractVersion" (its version). A file without readable
/// content still yields the document of its name; formats that no reader exists for have neither text nor error. The
/// text is at most 1 MiB.
///
/// Rights and content belong together: when the rights at the path are not the same before and after the content was
/// read, it is read again, three times in all. A file whose rights still change has the document of its name, with a
/// stamp that no file of that content has, so that whoever compares stamps tries it again.
///
/// Content is read by a daemon, "kovacontentextractd", which is started when it does not run. Blocks for the reading of
/// one file and of those before it. May be called by several threads at once.
/// @throws std::runtime_error when `path` does not exist or cannot be examined at all, and when content was wanted and
/// cannot be read at present, whatever the file: ExtractionProblem tells which it was.
void ParseFile(const std::string& path, const Json::Value& config, Json::Value& document);

/// Why content could not be read when this thread last called ParseFile: a sentence about the daemon, with its remedy.
/// "" when that was not so.
std::string ExtractionProblem();

/// The version of what reads files of a content type now; 0 when nothing does, or it is not installed. A document that
/// has an error, or was made when there was no reader, and an older version than this is worth another try.
int ExtractVersion(const std::string& content_type);

/// The "_KOVAStamp" that ParseFile gives a file whose `lstat` is `status`: a short text without control characters.
/// It changes when size, mtime (with nanoseconds), ctime or inode does, and does not depend on the path.
std::string Stamp(const struct stat& status);
/// Whether two stamps are of one file (inode), and of one with the same content as far as size and mtime tell.
bool SameFile(const std::string& stamp, const std::string& other);
bool SameContent(const std::string& stamp, const std::string& other);

/// The "_KOVAAccess" of the file or folder at `path`, whose `lstat` is `status`: who may do what with it, as
/// "UID:GID:MODE", or "UID:GID:MODE:ACL" where it has a POSIX ACL that says more than the mode. Ids are decimal, MODE
/// has four octal digits. ACL is a list, with commas, of "uID=P" (a named user), "g=P" (the owning group, in place of
/// the mode's bits, which are the mask then) and "gID=P" (a named group), P an octal digit, in the kernel's order:
/// "1000:100:0640:u5001=4,g=4,g200=6". Of a file whose ACL cannot be read MODE is 0000: nobody may read it. Makes at
/// most one call of the system, for the ACL.
std::string Access(const std::string& path, const struct stat& status);

}  // namespace KOVA::CONTENT_EXTRACT
