#include "services/kovacontentextractd/readers/mail.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <gmime/gmime.h>
#include <memory>
#include <string>
#include <utility>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/converters.h"
#include "services/kovacontentextractd/readers/cpu_budget.h"
#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/latin1.h"
#include "services/kovacontentextractd/readers/mail_extent.h"
#include "services/kovacontentextractd/readers/markup.h"

namespace ferrox::extract {

namespace {

// A message is headers and a tree of parts (MIME): "multipart/mixed" has parts one after the other, "alternative" the
// same text in several forms, "related" a page and what it is made of; leaves are texts and attached files. The library
// parses headers, transfer encodings and borders; here is decided what of the tree is text. A box (mbox) is a row of
// messages, each behind a line that begins with "From ".

// What is read of one file.
constexpr int kMessagesMax = 20000;
constexpr std::chrono::milliseconds kCpuMax(4000);
// Of one message.
constexpr int kMailPartsMax = 1000;
constexpr int kLevelsMax = 16;
constexpr int kAddressesMax = 500;
constexpr size_t kPartMaxBytes = 2U << 20;

/// For the library's objects, which count their users.
struct Unref {
  void operator()(void* object) const { g_object_unref(object); }
};
template <typename Type>
using Ref = std::unique_ptr<Type, Unref>;

struct FreeOptions {
  void operator()(GMimeParserOptions* options) const { g_mime_parser_options_free(options); }
};
using Options = std::unique_ptr<GMimeParserOptions, FreeOptions>;

/// Bytes outside ASCII in a header are UTF-8, or else taken for Latin-1, which can be undone.
Options HeaderOptions() {
  static const char* kFallbacks[] = {"utf-8", "iso-8859-1", nullptr};
  Options options(g_mime_parser_options_new());
  g_mime_parser_options_set_fallback_charsets(options.get(), kFallbacks);
  return options;
}

std::string_view View(const char* text) { return text != nullptr ? text : std::string_view(); }

/// Reads one message after the other out of a file.
class MailReader {
 public:
  MailReader(const Source& source, Findings& findings)
      : findings_(findings), is_box_(FileBytes(source).ReadAt(0, 5) == "From "), depth_(source.depth) {}

  void Read(const Source& source, int fd) {
    const uint64_t extent = MailExtent(source, is_box_);
    ReadMessages(fd, extent);
    if (extent < source.size) findings_.MarkCut();
  }

 private:
  void ReadMessages(int fd, uint64_t extent) {
    const Ref<GMimeStream> stream(g_mime_stream_fs_new_with_bounds(fd, 0, static_cast<gint64>(extent)));
    const Ref<GMimeParser> parser(g_mime_parser_new_with_stream(stream.get()));
    g_mime_parser_set_format(parser.get(), is_box_ ? GMIME_FORMAT_MBOX : GMIME_FORMAT_MESSAGE);
    const Options options = HeaderOptions();
    const CpuBudget budget(kCpuMax);
    for (int count = 0; count < kMessagesMax && !budget.IsSpent(); ++count) {
      const Ref<GMimeMessage> message(g_mime_parser_construct_message(parser.get(), options.get()));
      if (message == nullptr) {
        if (count == 0) findings_.Fail("damaged");
        return;
      }
      AddHeader(message.get());
      parts_ = 0;
      if (!AddMessageText(message.get(), 0) || !is_box_ || g_mime_parser_eos(parser.get()) != FALSE) return;
    }
    findings_.MarkCut();
  }

  /// People, and of a single message its subject, date and the like.
  void AddHeader(GMimeMessage* message) {
    encoding_ = TrueEncoding(View(g_mime_message_get_subject(message)));
    AddPeople(message, GMIME_ADDRESS_TYPE_FROM, field::kKOVAMDAuthors, field::kKOVAMDAuthorAddresses);
    AddPeople(message, GMIME_ADDRESS_TYPE_TO, field::kKOVAMDRecipients, field::kKOVAMDRecipientAddresses);
    AddPeople(message, GMIME_ADDRESS_TYPE_CC, field::kKOVAMDRecipients, field::kKOVAMDRecipientAddresses);
    if (is_box_) return;  // what is one message's
    findings_.Set(field::kKOVAMDTitle, HeaderText(g_mime_message_get_subject(message)));
    findings_.Set(field::kKOVAMDIdentifier, View(g_mime_message_get_message_id(message)));
    GMimeObject* headers = GMIME_OBJECT(message);
    findings_.Set(field::kKOVAMDEncodingApplications, View(g_mime_object_get_header(headers, "User-Agent")));
    findings_.Set(field::kKOVAMDEncodingApplications, View(g_mime_object_get_header(headers, "X-Mailer")));
    findings_.Set(field::kKOVAMDKeywords, View(g_mime_object_get_header(headers, "Keywords")));
    GDateTime* date = g_mime_message_get_date(message);
    if (date != nullptr) findings_.SetInteger(field::kKOVAMDContentCreationDate, g_date_time_to_unix(date));
  }

  /// A header's text, in the encoding that the message's subject has without saying so.
  std::string HeaderText(const char* text) const {
    std::string value(View(text));
    return encoding_.empty() ? value : InTrueEncoding(std::move(value), encoding_);
  }

  void AddPeople(GMimeMessage* message, GMimeAddressType type, const char* names, const char* addresses) {
    AddAddresses(g_mime_message_get_addresses(message, type), names, addresses, 0);
  }

  /// Names and addresses; those of a group ("team: a@b, c@d;") one by one.
  void AddAddresses(InternetAddressList* list, const char* names, const char* addresses, int level) {
    const int length = list != nullptr ? internet_address_list_length(list) : 0;
    const int count = level < 3 ? std::min(length, kAddressesMax) : 0;
    if (count < length) findings_.Omit("not all of its people");
    for (int i = 0; i < count; ++i) {
      InternetAddress* address = internet_address_list_get_address(list, i);
      const std::string name = HeaderText(internet_address_get_name(address));
      if (INTERNET_ADDRESS_IS_GROUP(address)) {
        InternetAddressList* members = internet_address_group_get_members(INTERNET_ADDRESS_GROUP(address));
        AddAddresses(members, names, addresses, level + 1);
      } else if (INTERNET_ADDRESS_IS_MAILBOX(address)) {
        const std::string_view mailbox = View(internet_address_mailbox_get_addr(INTERNET_ADDRESS_MAILBOX(address)));
        findings_.Append(names, name.empty() ? mailbox : std::string_view(name));
        findings_.Append(addresses, mailbox);
      }
    }
  }

  /// False when the findings take no more.
  bool AddMessageText(GMimeMessage* message, int level) {
    if (is_box_ || level > 0) AddLine(HeaderText(g_mime_message_get_subject(message)));
    return AddObject(g_mime_message_get_mime_part(message), level);
  }

  /// A node of the tree, of whatever kind. `level` is its depth. False when the findings take no more.
  bool AddObject(GMimeObject* object, int level) {
    if (object == nullptr) return true;
    if (level > kLevelsMax || ++parts_ > kMailPartsMax) return LeaveOut("not all of its parts");
    if (GMIME_IS_MULTIPART(object)) return AddMultipart(GMIME_MULTIPART(object), level);
    if (GMIME_IS_MESSAGE_PART(object)) {
      return AddInnerMessage(g_mime_message_part_get_message(GMIME_MESSAGE_PART(object)), level);
    }
    return !GMIME_IS_PART(object) || AddPart(GMIME_PART(object));
  }

  /// A message within a message is a file in a file.
  bool AddInnerMessage(GMimeMessage* message, int level) {
    if (message == nullptr) return true;
    if (depth_ == findings_.Bounds().nesting) return LeaveOut("not the messages deep within others");
    ++depth_;
    const bool more = AddMessageText(message, level + 1);
    --depth_;
    return more;
  }

  bool LeaveOut(std::string_view what) {
    findings_.Omit(what);
    return true;
  }

  bool AddMultipart(GMimeMultipart* multipart, int level) {
    GMimeContentType* type = g_mime_object_get_content_type(GMIME_OBJECT(multipart));
    const int count = std::min(g_mime_multipart_get_count(multipart), kMailPartsMax);
    if (Is(type, "multipart", "alternative")) {
      if (GMimeObject* plain = PlainAlternative(multipart, count)) return AddAlternatives(multipart, plain, level);
    }
    const bool outer = std::exchange(in_page_, in_page_ || Is(type, "multipart", "related"));
    bool more = true;
    for (int i = 0; more && i < count; ++i) more = AddObject(g_mime_multipart_get_part(multipart, i), level + 1);
    in_page_ = outer;
    return more;
  }

  /// The part in plain text; null when there is none.
  static GMimeObject* PlainAlternative(GMimeMultipart* multipart, int count) {
    for (int i = 0; i < count; ++i) {
      GMimeObject* part = g_mime_multipart_get_part(multipart, i);
      GMimeContentType* type = g_mime_object_get_content_type(part);
      if (Is(type, "text", "plain")) return part;
    }
    return nullptr;
  }

  /// Of the same text in several forms, the plain one. Others may hold files beside it, and more text where the plain
  /// one only says that there is another.
  bool AddAlternatives(GMimeMultipart* multipart, GMimeObject* plain, int level) {
    const size_t before = findings_.Text().size();
    if (!AddObject(plain, level + 1)) return false;
    const size_t outer = std::exchange(plain_bytes_, std::max<size_t>(1, findings_.Text().size() - before));
    bool more = true;
    const int count = std::min(g_mime_multipart_get_count(multipart), kMailPartsMax);
    for (int i = 0; more && i < count; ++i) {
      GMimeObject* part = g_mime_multipart_get_part(multipart, i);
      if (part != plain) more = AddObject(part, level + 1);
    }
    plain_bytes_ = outer;
    return more;
  }

  /// A leaf: its name, and its text, or what it is made of for the reader of its kind. While the forms beside a plain
  /// text are read, one counts only when it is more than twice as long.
  bool AddPart(GMimePart* part) {
    const std::string_view name = View(g_mime_part_get_filename(part));
    AddLine(name);
    GMimeContentType* type = g_mime_object_get_content_type(GMIME_OBJECT(part));
    if (!Is(type, "text", "*") || Is(type, "text", "rtf") || Is(type, "text", "xml")) {
      Attach(part, type, name);
      return true;
    }
    const std::string bytes = Unpacked(part, kPartMaxBytes);
    const char* charset = g_mime_object_get_content_type_parameter(GMIME_OBJECT(part), "charset");
    DecodedText decoded;
    const bool cut = bytes.size() == kPartMaxBytes;
    if (!Decode(bytes, cut, std::string(View(charset)), decoded)) return true;
    if (Is(type, "text", "html")) decoded.text = ReadHtml(decoded.text, findings_.Bounds().text_bytes).text;
    if (plain_bytes_ > 0 && decoded.text.size() <= 2 * plain_bytes_) return true;
    const bool more = findings_.AddText(decoded.text);
    findings_.Break();
    return more;
  }

  static bool Is(GMimeContentType* type, const char* kind, const char* subtype) {
    return g_mime_content_type_is_type(type, kind, subtype) != FALSE;
  }

  /// Hands on what is no text itself, but may have some. What is too large is cut off, and so dropped.
  void Attach(GMimePart* part, GMimeContentType* type, std::string_view name) {
    const std::string_view disposition = View(g_mime_object_get_disposition(GMIME_OBJECT(part)));
    if (in_page_ && disposition != GMIME_DISPOSITION_ATTACHMENT) return;  // what a page is made of: styles, scripts
    const bool has_none = Is(type, "image", "*") || Is(type, "audio", "*") || Is(type, "video", "*");
    const size_t room = findings_.AttachmentRoom();
    if (has_none) return;
    if (room == 0) return findings_.Omit("not all of its attachments");
    if (depth_ >= findings_.Bounds().nesting) return findings_.Omit("not the files within its attachments");
    findings_.Attach({std::string(name), Unpacked(part, room + 1)});
  }

  /// The part's content without its transfer encoding, at most `limit_bytes`.
  static std::string Unpacked(GMimePart* part, size_t limit_bytes) {
    GMimeDataWrapper* content = g_mime_part_get_content(part);
    GMimeStream* packed = content != nullptr ? g_mime_data_wrapper_get_stream(content) : nullptr;
    if (packed == nullptr) return {};
    (void)g_mime_stream_reset(packed);
    const Ref<GMimeStream> stream(g_mime_stream_filter_new(packed));
    const Ref<GMimeFilter> filter(g_mime_filter_basic_new(g_mime_data_wrapper_get_encoding(content), FALSE));
    (void)g_mime_stream_filter_add(GMIME_STREAM_FILTER(stream.get()), filter.get());
    std::string bytes;
    std::array<char, 16384> piece;
    while (bytes.size() < limit_bytes) {
      const size_t wanted = std::min(piece.size(), limit_bytes - bytes.size());
      const ssize_t got = g_mime_stream_read(stream.get(), piece.data(), wanted);
      if (got <= 0) break;
      bytes.append(piece.data(), static_cast<size_t>(got));
    }
    return bytes;
  }

  void AddLine(std::string_view text) {
    if (text.empty()) return;
    (void)findings_.AddText(text);
    findings_.Break();
  }

  Findings& findings_;
  bool is_box_;
  int depth_;
  int parts_ = 0;
  bool in_page_ = false;    ///< among the parts of one page
  size_t plain_bytes_ = 0;  ///< of the plain form of what is read, where there is one; 0 where there is none
  std::string encoding_;    ///< of headers that are bytes outside ASCII and not UTF-8; empty for Latin-1
};

}  // namespace

void PrepareMail() {
  static const bool once = [] {
    g_mime_init();
    // The encodings of headers, by the names that the library has for them.
    for (const char* encoding : {"ISO-8859-1", "ISO-8859-9", "GB2312", "GBK", "BIG5", "EUC-KR", "KOI8-R", "SHIFT_JIS",
                                 "TIS-620", "UTF-7", "UTF-16"}) {
      HoldConverter(encoding, "UTF-8");
    }
    return true;
  }();
  (void)once;
}

void ReadMail(const Source& source, Findings& findings) {
  PrepareMail();
  const int fd = dup(source.fd);  // the library closes it
  if (fd < 0 || lseek(fd, 0, SEEK_SET) != 0) {
    if (fd >= 0) (void)close(fd);
    return findings.Fail("damaged");
  }
  MailReader(source, findings).Read(source, fd);
}

}  // namespace ferrox::extract
