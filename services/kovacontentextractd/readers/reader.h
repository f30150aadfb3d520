#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include <json/value.h>

#include "wire/fields.h"

/// Readers get text and metadata out of one file. They run in a worker without file system and without rights: all they
/// have is the open file. They may be given anything, and must not trust a byte of it; what the kernel enforces on the
/// worker (memory, time) is the last line, not the first.
///
/// Each reader has a header with one function of the type Reader and, where its library needs files, one that loads
/// these beforehand; the programs in workers/ list them by the names that kova/content_type.h knows. A reader reads as
/// far as it can and says in the findings what stopped it; it keeps a bound of its own on all that a file can make
/// long: depth, numbers of things, bytes unpacked, time.
namespace ferrox::extract {

/// The fields that findings fill, by the names of the index schema: field::kKOVAMDTitle.
namespace field = fileindex::elastic;

/// What bounds every reader.
struct Limits {
  size_t text_bytes = 1U << 20;         ///< of text that is kept
  uint64_t expansion_free = 1U << 20;   ///< unpacked bytes that are never too many
  uint64_t expansion_ratio = 100;       ///< beyond them, unpacked bytes for each packed one
  uint64_t member_bytes = 50ULL << 20;  ///< of one member of an archive or container, unpacked
  int nesting = 2;                      ///< of files in files
  size_t attachments = 50;              ///< files in it that are handed on
  size_t attached_bytes = 15U << 20;    ///< of all of them
};

/// How a reason begins that says what is missing of a file that was read.
inline constexpr std::string_view kPartlyRead = "partly read: ";

/// A file within the file, which the reader of its own kind is to read.
struct Attachment {
  std::string name;  ///< for hints
  std::string bytes;
};

/// One file to read. The descriptor is open for reading, can seek, and is not the reader's to close.
struct Source {
  int fd = -1;
  uint64_t size = 0;
  std::string name = {};       ///< its last component, for hints; bytes
  std::string extension = {};  ///< in lower case, without the dot
  int depth = 0;               ///< how many files it is inside of
};

/// What a reader found in one file, collected within the limits. For one thread.
class Findings {
 public:
  explicit Findings(const Limits& limits = {}) : limits_(limits) {}
  const Limits& Bounds() const { return limits_; }

  /// Adds text in UTF-8; what is not is replaced. Text beyond the limit is dropped and noted as cut. False when no more
  /// is kept, so that a reader may stop.
  bool AddText(std::string_view text);
  /// Notes that there is more text than was added.
  void MarkCut() { cut_ = true; }
  /// Ends a line, paragraph, cell or page: the words before and behind do not touch.
  void Break();

  /// Metadata: one of the fields above, with the type that the index schema gives it. An empty text, and what is not
  /// finite, is not set. Set replaces; Append joins several values of one field (authors, keywords) with ", ", each
  /// once.
  void Set(const char* field, std::string_view value);
  void Append(const char* field, std::string_view value);
  void SetInteger(const char* field, int64_t value);
  void SetNumber(const char* field, double value);

  /// How many bytes an attachment may have now; 0 when no more are taken.
  size_t AttachmentRoom() const;
  /// Hands a file within this one on. What is beyond the limits is dropped, and that noted.
  void Attach(Attachment attachment);

  /// The reason why the content, or a part of it, could not be read, in a few words ("encrypted", "damaged",
  /// "expands to too much"). The first one counts; what was found besides is kept.
  void Fail(std::string_view reason);

  /// Notes that something but text was left out ("not all of its attachments"); told unless there is a reason of Fail.
  void Omit(std::string_view what);

  bool HasText() const { return !text_.empty(); }
  const std::string& Text() const { return text_; }
  const std::vector<Attachment>& Attachments() const { return attachments_; }
  /// The document's members but the text: the fields, "_KOVATextCut", "_KOVAExtractError".
  Json::Value ToFields() const;
  /// All of them: the text is "KOVAMDTextContent".
  Json::Value ToDocument() const;

 private:
  Limits limits_;
  std::string text_;
  bool cut_ = false;
  int appended_ = 0;  ///< values of lists
  std::string failure_;
  std::string omitted_;
  std::vector<Attachment> attachments_;
  size_t attached_bytes_ = 0;
  Json::Value fields_ = Json::Value(Json::objectValue);
};

/// Reads one kind of file. Does not throw for anything that a file can hold.
using Reader = void (*)(const Source& source, Findings& findings);

}  // namespace ferrox::extract
