#include "services/kovacontentextractd/readers/photo/photo.h"

#include <algorithm>
#include <cmath>
#include <exception>
#include <exiv2/exiv2.hpp>
#include <new>
#include <span>
#include <string>

#include "services/kovacontentextractd/readers/mapped_file.h"
#include "services/kovacontentextractd/readers/photo/gif.h"
#include "services/kovacontentextractd/readers/photo/heif.h"
#include "services/kovacontentextractd/readers/photo/photo_fields.h"
#include "services/kovacontentextractd/readers/photo/png.h"
#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

/// The items of a value one by one: lists of names, texts in several languages.
void AddValue(const PhotoRow& row, const Exiv2::Value& value, PhotoFields& fields) {
  constexpr long kItemsMax = 1000;
  const auto* comment = dynamic_cast<const Exiv2::CommentValue*>(&value);
  if (comment != nullptr) return fields.Add(row.field, comment->comment());
  if (value.typeId() == Exiv2::langAlt) {
    const auto& texts = static_cast<const Exiv2::LangAltValue&>(value);
    return fields.Add(row.field, texts.value_.empty() ? std::string() : texts.value_.begin()->second);
  }
  if (value.typeId() != Exiv2::xmpBag && value.typeId() != Exiv2::xmpSeq)
    return fields.Add(row.field, value.toString());
  for (long i = 0; i < std::min(value.count(), kItemsMax); ++i) fields.Add(row.field, value.toString(i));
}

/// Rational numbers as exactly as people wrote them: 2.8 is no 2.7999999523.
double NumberOf(const Exiv2::Exifdatum& datum) {
  const Exiv2::Rational number = datum.toRational();
  return number.second != 0 ? static_cast<double>(number.first) / number.second : static_cast<double>(datum.toFloat());
}

/// The rows of EXIF, and the numbers that only it has.
void AddExif(const Exiv2::ExifData& exif, PhotoFields& fields, Findings& findings) {
  for (const PhotoRow& row : ExifRows()) {
    const auto found = exif.findKey(Exiv2::ExifKey(row.key));
    if (found == exif.end() || found->count() == 0) continue;
    if (row.kind == PhotoRow::kInteger) {
      findings.SetInteger(row.field, found->toLong());
    } else if (row.kind == PhotoRow::kNumber) {
      findings.SetNumber(row.field, NumberOf(*found));
    } else if (row.kind == PhotoRow::kShown) {
      fields.Add(row.field, found->print(&exif));
    } else {
      AddValue(row, found->value(), fields);
    }
  }
}

/// The rows of IPTC or XMP. A key may occur several times, each with a value of its list.
template <typename Key, typename Data>
void AddRows(const Data& data, std::span<const PhotoRow> rows, PhotoFields& fields) {
  for (const PhotoRow& row : rows) {
    const Key key(row.key);
    for (const auto& datum : data) {
      if (datum.key() == key.key()) AddValue(row, datum.value(), fields);
    }
  }
}

// The text of one key; empty where the file has none. One function for each of the library's three unrelated types.
std::string TextOf(const Exiv2::ExifData& exif, const char* key) {
  const auto found = exif.findKey(Exiv2::ExifKey(key));
  return found != exif.end() ? found->toString() : std::string();
}

std::string TextOf(const Exiv2::XmpData& xmp, const char* key) {
  const auto found = xmp.findKey(Exiv2::XmpKey(key));
  return found != xmp.end() ? found->toString() : std::string();
}

std::string TextOf(const Exiv2::IptcData& iptc, const char* key) {
  const auto found = iptc.findKey(Exiv2::IptcKey(key));
  return found != iptc.end() ? found->toString() : std::string();
}

/// When the picture was taken, else when it was digitized, made or changed.
void AddTimes(const Exiv2::Image& image, Findings& findings) {
  const Exiv2::ExifData& exif = image.exifData();
  const Exiv2::XmpData& xmp = image.xmpData();
  const Exiv2::IptcData& iptc = image.iptcData();
  const std::string changed = TextOf(exif, "Exif.Image.DateTime") + TextOf(exif, "Exif.Photo.OffsetTime");
  for (const std::string& text :
       {TextOf(exif, "Exif.Photo.DateTimeOriginal") + TextOf(exif, "Exif.Photo.OffsetTimeOriginal"),
        TextOf(exif, "Exif.Image.DateTimeOriginal"), TextOf(xmp, "Xmp.exif.DateTimeOriginal"),
        TextOf(exif, "Exif.Photo.DateTimeDigitized"), TextOf(xmp, "Xmp.photoshop.DateCreated"),
        TextOf(iptc, "Iptc.Application2.DateCreated") + " " + TextOf(iptc, "Iptc.Application2.TimeCreated"),
        TextOf(xmp, "Xmp.xmp.CreateDate"), changed}) {
    const auto taken = ParseTime(text);
    if (!taken.has_value()) continue;
    findings.SetInteger(field::kKOVAMDContentCreationDate, *taken);
    break;
  }
  if (const auto time = ParseTime(changed)) findings.SetInteger(field::kKOVAMDContentModificationDate, *time);
}

/// Exposures are shown as photographers write them: "1/250", "2".
void AddExposure(const Exiv2::ExifData& exif, Findings& findings) {
  const auto found = exif.findKey(Exiv2::ExifKey("Exif.Photo.ExposureTime"));
  if (found != exif.end() && found->count() > 0) {
    const double seconds = NumberOf(*found);
    if (seconds > 0 && seconds < 1) {
      findings.Set(field::kKOVAMDExposureTimeString, "1/" + std::to_string(std::llround(std::min(1 / seconds, 1e9))));
    } else if (seconds >= 1 && seconds < 1e9) {
      findings.Set(field::kKOVAMDExposureTimeString, std::to_string(std::llround(seconds)));
    }
  }
  const auto speed = Exiv2::isoSpeed(exif);  // of some cameras, only what the maker adds has it
  if (speed != exif.end() && speed->count() > 0 && speed->toLong() > 0) {
    findings.SetInteger(field::kKOVAMDISOSpeed, speed->toLong());
  }
  const auto flash = exif.findKey(Exiv2::ExifKey("Exif.Photo.Flash"));
  if (flash != exif.end() && flash->count() > 0) findings.SetInteger(field::kKOVAMDFlashOnOff, flash->toLong() & 1);
}

/// In dots for an inch; unit 3 means dots for a centimetre.
void AddResolution(const Exiv2::ExifData& exif, Findings& findings) {
  const auto unit = exif.findKey(Exiv2::ExifKey("Exif.Image.ResolutionUnit"));
  const float inches = unit != exif.end() && unit->count() > 0 && unit->toLong() == 3 ? 2.54F : 1.0F;
  const auto add = [&](const char* key, const char* field) {
    const auto found = exif.findKey(Exiv2::ExifKey(key));
    if (found == exif.end() || found->count() == 0) return;
    const float value = found->toFloat() * inches;
    if (value > 0 && value < 1e6F) findings.SetInteger(field, std::lround(value));
  };
  add("Exif.Image.XResolution", field::kKOVAMDResolutionWidthDPI);
  add("Exif.Image.YResolution", field::kKOVAMDResolutionHeightDPI);
}

void AddPixels(const Exiv2::Image& image, Findings& findings) {
  const int64_t width = image.pixelWidth(), height = image.pixelHeight();
  if (width <= 0 || height <= 0) return;
  findings.SetInteger(field::kKOVAMDPixelWidth, width);
  findings.SetInteger(field::kKOVAMDPixelHeight, height);
  findings.SetInteger(field::kKOVAMDPixelCount, width * height);
}

/// Names that programs give faces, and places that they write in several parts.
void AddNamedParts(const Exiv2::XmpData& xmp, PhotoFields& fields) {
  static constexpr struct {
    const char* within;
    const char* end;
    const char* field;
  } kParts[] = {
      {"Xmp.mwg-rs.Regions/", "/mwg-rs:Name", field::kKOVAMDPeopleDisplayName},
      {"Xmp.MP.RegionInfo/", "/MPReg:PersonDisplayName", field::kKOVAMDPeopleDisplayName},
      {"Xmp.iptcExt.LocationCreated", "/Iptc4xmpExt:Sublocation", field::kKOVAMDNamedLocation},
      {"Xmp.iptcExt.LocationCreated", "/Iptc4xmpExt:City", field::kKOVAMDCity},
      {"Xmp.iptcExt.LocationCreated", "/Iptc4xmpExt:ProvinceState", field::kKOVAStateOrProvince},
      {"Xmp.iptcExt.LocationCreated", "/Iptc4xmpExt:CountryName", field::kKOVAMDCountry},
  };
  for (const auto& datum : xmp) {
    const std::string key = datum.key();
    for (const auto& part : kParts) {
      if (key.starts_with(part.within) && key.ends_with(part.end)) fields.Add(part.field, datum.toString());
    }
  }
}

/// The names of the place together, from the nearest to the widest.
void AddPlace(const PhotoFields& fields, Findings& findings) {
  std::string place;
  for (const char* part :
       {field::kKOVAMDNamedLocation, field::kKOVAMDCity, field::kKOVAStateOrProvince, field::kKOVAMDCountry}) {
    const std::string name = fields.Value(part);
    if (!name.empty()) place += (place.empty() ? "" : ", ") + name;
  }
  findings.Set(field::kKOVAMDNamedLocation, place);
}

void AddGifTexts(std::string_view file, Exiv2::Image& image, PhotoFields& fields) {
  const GifTexts texts = ReadGifTexts(file);
  if (!texts.xmp.empty()) (void)Exiv2::XmpParser::decode(image.xmpData(), texts.xmp);
  fields.Add(field::kKOVAMDComment, texts.comment);
}

/// The library finds these parts in some HEIF files only.
void AddHeifParts(std::string_view file, Exiv2::Image& image) {
  const HeifParts parts = ReadHeifParts(file);
  if (!parts.exif.empty() && image.exifData().empty()) {
    (void)Exiv2::ExifParser::decode(image.exifData(), reinterpret_cast<const Exiv2::byte*>(parts.exif.data()),
                                    static_cast<uint32_t>(parts.exif.size()));
  }
  if (!parts.xmp.empty() && image.xmpData().empty()) (void)Exiv2::XmpParser::decode(image.xmpData(), parts.xmp);
}

void AddPngTexts(const PngParts& parts, PhotoFields& fields) {
  static constexpr std::pair<std::string_view, const char*> kKeywords[] = {
      {"Title", field::kKOVAMDTitle},
      {"Author", field::kKOVAMDAuthors},
      {"Description", field::kKOVAMDDescription},
      {"Comment", field::kKOVAMDComment},
      {"parameters", field::kKOVAMDComment},
      {"Copyright", field::kKOVAMDCopyright},
      {"Software", field::kKOVAMDCreator},
      {"Make", field::kKOVAMDAcquisitionMake},
      {"Model", field::kKOVAMDAcquisitionModel},
  };
  for (const auto& [keyword, text] : parts.texts) {
    for (const auto& [known, field] : kKeywords) {
      if (keyword == known) fields.Add(field, text);
    }
  }
}

/// `png` is what the file has beside its picture, where it is a PNG file.
void ReadImage(std::string_view file, const PngParts& png, Findings& findings) {
  const auto* data = reinterpret_cast<const Exiv2::byte*>(file.data());
  const auto image = Exiv2::ImageFactory::open(data, static_cast<long>(file.size()));
  try {
    image->readMetadata();
  } catch (const Exiv2::AnyError&) {
    findings.Fail("damaged");  // what was read until then holds
  }
  PhotoFields fields(findings);
  AddPixels(*image, findings);
  AddHeifParts(file, *image);
  if (image->mimeType() == "image/gif") AddGifTexts(file, *image, fields);
  // What people wrote with programs counts more than what cameras put there.
  AddRows<Exiv2::XmpKey>(image->xmpData(), XmpRows(), fields);
  AddNamedParts(image->xmpData(), fields);
  AddRows<Exiv2::IptcKey>(image->iptcData(), IptcRows(), fields);
  AddExif(image->exifData(), fields, findings);
  AddRows<Exiv2::XmpKey>(image->xmpData(), CopiedRows(), fields);
  AddPngTexts(png, fields);
  fields.Add(field::kKOVAMDComment, image->comment());
  AddTimes(*image, findings);
  AddExposure(image->exifData(), findings);
  AddResolution(image->exifData(), findings);
  AddPlace(fields, findings);
}

}  // namespace

void PreparePhoto() {
  Exiv2::LogMsg::setLevel(Exiv2::LogMsg::mute);
  Exiv2::XmpParser::initialize();
  Exiv2::enableBMFF(true);
}

void ReadPhoto(const Source& source, Findings& findings) {
  PreparePhoto();
  const char* problem = "damaged";
  try {
    const PngParts png = ReadPngParts(source);
    if (!png.file.empty()) return ReadImage(png.file, png, findings);
    const MappedFile file(source);
    if (!file.IsWhole()) problem = "too large";  // when that was not enough of it
    if (file.Data() == nullptr) return findings.Fail(problem);
    ReadImage({reinterpret_cast<const char*>(file.Data()), file.Size()}, png, findings);
  } catch (const std::bad_alloc&) {
    findings.Fail("needs too much memory");
  } catch (const std::exception&) {
    findings.Fail(problem);
  }
}

}  // namespace ferrox::extract
