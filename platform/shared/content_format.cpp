#include <iterator>

#include <kova/content_type.h>

namespace kova::content {

namespace {

using namespace std::literals;

constexpr Format kFormats[] = {
    {"application/json", "plain", Program::kGeneral, 1},
    {"application/toml", "plain", Program::kGeneral, 1},
    {"application/x-cue", "plain", Program::kGeneral, 1},
    {"application/xml-dtd", "plain", Program::kGeneral, 1},
    {"application/yaml", "plain", Program::kGeneral, 1},
    {"audio/x-mpegurl", "plain", Program::kGeneral, 1},
    {"audio/x-scpls", "plain", Program::kGeneral, 1},
    {"text/html", "html", Program::kGeneral, 1},
    {"application/xhtml+xml", "html", Program::kGeneral, 1},
    {"application/xml", "xml", Program::kGeneral, 1},
    {"text/x-opml", "xml", Program::kGeneral, 1},
    {"application/pdf", "pdf", Program::kPdf, 1},
    {"application/vnd.openxmlformats-officedocument.presentationml.presentation", "office", Program::kGeneral, 1},
    {"application/vnd.openxmlformats-officedocument.spreadsheetml.sheet", "office", Program::kGeneral, 1},
    {"application/vnd.openxmlformats-officedocument.wordprocessingml.document", "office", Program::kGeneral, 1},
    {"application/vnd.oasis.opendocument.graphics", "open-document", Program::kGeneral, 1},
    {"application/vnd.oasis.opendocument.presentation", "open-document", Program::kGeneral, 1},
    {"application/vnd.oasis.opendocument.spreadsheet", "open-document", Program::kGeneral, 1},
    {"application/vnd.oasis.opendocument.text", "open-document", Program::kGeneral, 1},
    {"application/epub+zip", "book", Program::kGeneral, 1},
    {"application/msword", "old-office", Program::kGeneral, 1},
    {"application/vnd.ms-excel", "old-office", Program::kGeneral, 1},
    {"application/vnd.ms-powerpoint", "old-office", Program::kGeneral, 1},
    {"application/vnd.ms-outlook", "old-office", Program::kGeneral, 1},
    {"application/x-ole-storage", "old-office", Program::kGeneral, 1},
    {"application/rtf", "rich-text", Program::kGeneral, 1},
    {"message/rfc822", "mail", Program::kMail, 1},
    {"application/mbox", "mail", Program::kMail, 1},
    {"multipart/related", "mail", Program::kMail, 1},
    {"application/zip", "archive", Program::kGeneral, 2},
    {"application/java-archive", "archive", Program::kGeneral, 1},
    {"application/x-tar", "archive", Program::kGeneral, 2},
    {"application/gzip", "archive", Program::kGeneral, 2},
    {"application/x-bzip2", "archive", Program::kGeneral, 2},
    {"application/x-xz", "archive", Program::kGeneral, 2},
    {"application/zstd", "archive", Program::kGeneral, 2},
    {"application/x-7z-compressed", "archive", Program::kGeneral, 2},
    {"application/vnd.rar", "archive", Program::kGeneral, 2},
    {"application/x-cpio", "archive", Program::kGeneral, 2},
    {"application/x-compress", "archive", Program::kGeneral, 1},
    {"application/x-lzma", "archive", Program::kGeneral, 1},
    {"application/x-lzip", "archive", Program::kGeneral, 1},
    {"application/x-lz4", "archive", Program::kGeneral, 1},
    {"application/x-lha", "archive", Program::kGeneral, 1},
    {"application/x-rpm", "archive", Program::kGeneral, 1},
    {"application/x-archive", "archive", Program::kGeneral, 1},
    {"application/vnd.debian.binary-package", "archive", Program::kGeneral, 1},
    {"application/vnd.ms-cab-compressed", "archive", Program::kGeneral, 1},
    {"application/vnd.android.package-archive", "archive", Program::kGeneral, 1},
    {"application/x-iso9660-image", "archive", Program::kGeneral, 1},
    {"image/jpeg", "photo", Program::kPhoto, 1},
    {"image/tiff", "photo", Program::kPhoto, 1},
    {"image/png", "photo", Program::kPhoto, 1},
    {"image/webp", "photo", Program::kPhoto, 1},
    {"image/heic", "photo", Program::kPhoto, 1},
    {"image/avif", "photo", Program::kPhoto, 1},
    {"image/vnd.adobe.photoshop", "photo", Program::kPhoto, 1},
    {"image/x-raw", "photo", Program::kPhoto, 1},
    {"image/gif", "photo", Program::kPhoto, 1},
    {"image/bmp", "photo", Program::kPhoto, 1},
    {"image/jp2", "photo", Program::kPhoto, 1},
    {"audio/mpeg", "audio", Program::kGeneral, 1},
    {"audio/flac", "audio", Program::kGeneral, 1},
    {"audio/ogg", "audio", Program::kGeneral, 1},
    {"audio/mp4", "audio", Program::kGeneral, 1},
    {"audio/x-wav", "audio", Program::kGeneral, 1},
    {"audio/x-aiff", "audio", Program::kGeneral, 1},
    {"audio/x-ape", "audio", Program::kGeneral, 1},
    {"audio/x-wavpack", "audio", Program::kGeneral, 1},
    {"audio/x-musepack", "audio", Program::kGeneral, 1},
    {"audio/x-ms-wma", "audio", Program::kGeneral, 1},
    {"audio/x-dsd", "audio", Program::kGeneral, 1},
    {"audio/x-tta", "audio", Program::kGeneral, 1},
    {"audio/x-mod", "audio", Program::kGeneral, 1},
    {"audio/aac", "video", Program::kVideo, 1},
    {"audio/ac3", "video", Program::kVideo, 1},
    {"audio/eac3", "video", Program::kVideo, 1},
    {"audio/amr", "video", Program::kVideo, 1},
    {"audio/amr-wb", "video", Program::kVideo, 1},
    {"audio/basic", "audio", Program::kGeneral, 1},
    {"audio/midi", "video", Program::kVideo, 1},
    {"audio/vnd.dts", "video", Program::kVideo, 1},
    {"audio/webm", "video", Program::kVideo, 1},
    {"audio/x-caf", "audio", Program::kGeneral, 1},
    {"audio/x-dff", "video", Program::kVideo, 1},
    {"audio/x-matroska", "video", Program::kVideo, 1},
    {"audio/x-rf64", "video", Program::kVideo, 1},
    {"audio/x-w64", "video", Program::kVideo, 1},
    {"video/mp4", "video", Program::kVideo, 1},
    {"video/quicktime", "video", Program::kVideo, 1},
    {"video/x-matroska", "video", Program::kVideo, 1},
    {"video/webm", "video", Program::kVideo, 1},
    {"video/x-msvideo", "video", Program::kVideo, 1},
    {"video/x-ms-wmv", "video", Program::kVideo, 1},
    {"video/mpeg", "video", Program::kVideo, 1},
    {"video/mp2t", "video", Program::kVideo, 1},
    {"video/x-flv", "video", Program::kVideo, 1},
    {"video/3gpp", "video", Program::kVideo, 1},
    {"video/ogg", "video", Program::kVideo, 1},
    {"video/x-dv", "video", Program::kVideo, 1},
};

/// What is none of the above.
constexpr Format kOtherXml = {"", "xml", Program::kGeneral, 1};
constexpr Format kOtherText = {"", "plain", Program::kGeneral, 1};

}  // namespace

const Format kUnknown = {"", "unknown", Program::kGeneral, 1};

const char* ProgramName(Program program) {
  static constexpr const char* kNames[kPrograms] = {"kovacontentworker", "kovacontentworker-mail",
                                                    "kovacontentworker-pdf", "kovacontentworker-photo",
                                                    "kovacontentworker-video"};
  return kNames[static_cast<int>(program)];
}

const Format* FormatOf(std::string_view type) {
  for (const Format& format : kFormats) {
    if (format.type == type) return &format;
  }
  if (type.size() > 4 && type.substr(type.size() - 4) == "+xml"sv) return &kOtherXml;
  return type.substr(0, 5) == "text/"sv ? &kOtherText : nullptr;
}

}  // namespace kova::content
