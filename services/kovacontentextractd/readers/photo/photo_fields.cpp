#include "services/kovacontentextractd/readers/photo/photo_fields.h"

#include <string_view>

#include "services/kovacontentextractd/readers/latin1.h"

namespace ferrox::extract {

namespace {

constexpr PhotoRow kExifRows[] = {
    {"Exif.Image.Make", field::kKOVAMDAcquisitionMake},
    {"Exif.Image.Model", field::kKOVAMDAcquisitionModel},
    {"Exif.Image.UniqueCameraModel", field::kKOVAMDAcquisitionModel},
    {"Exif.Image.Software", field::kKOVAMDCreator},
    {"Exif.Image.ImageDescription", field::kKOVAMDDescription},
    {"Exif.Image.Copyright", field::kKOVAMDCopyright},
    {"Exif.Image.Artist", field::kKOVAMDAuthors},
    {"Exif.Image.Orientation", field::kKOVAMDOrientation, PhotoRow::kInteger},
    {"Exif.Image.XPTitle", field::kKOVAMDTitle, PhotoRow::kShown},
    {"Exif.Image.XPComment", field::kKOVAMDComment, PhotoRow::kShown},
    {"Exif.Image.XPKeywords", field::kKOVAMDKeywords, PhotoRow::kShown},
    {"Exif.Image.XPAuthor", field::kKOVAMDAuthors, PhotoRow::kShown},
    {"Exif.Image.Rating", field::kKOVAMDStarRating, PhotoRow::kShown},
    {"Exif.Photo.UserComment", field::kKOVAMDComment},
    {"Exif.Photo.ExposureTime", field::kKOVAMDExposureTimeSeconds, PhotoRow::kNumber},
    {"Exif.Photo.FNumber", field::kKOVAMDFNumber, PhotoRow::kNumber},
    {"Exif.Photo.FNumber", field::kKOVAMDAperture, PhotoRow::kShown},
    {"Exif.Photo.MaxApertureValue", field::kKOVAMDMaxAperture, PhotoRow::kNumber},
    {"Exif.Photo.FocalLength", field::kKOVAMDFocalLength, PhotoRow::kNumber},
    {"Exif.Photo.ExposureProgram", field::kKOVAMDExposureProgram, PhotoRow::kShown},
    {"Exif.Photo.ExposureMode", field::kKOVAMDExposureMode, PhotoRow::kShown},
    {"Exif.Photo.MeteringMode", field::kKOVAMDMeteringMode, PhotoRow::kShown},
    {"Exif.Photo.WhiteBalance", field::kKOVAMDWhiteBalance, PhotoRow::kShown},
    {"Exif.Photo.ColorSpace", field::kKOVAMDColorSpace, PhotoRow::kShown},
    {"Exif.Photo.ExifVersion", field::kKOVAMDEXIFVersion, PhotoRow::kShown},
    {"Exif.Image.BitsPerSample", field::kKOVAMDBitsPerSample, PhotoRow::kInteger},
};

constexpr PhotoRow kIptcRows[] = {
    {"Iptc.Application2.ObjectName", field::kKOVAMDTitle},
    {"Iptc.Application2.Headline", field::kKOVAMDHeadline},
    {"Iptc.Application2.Caption", field::kKOVAMDDescription},
    {"Iptc.Application2.Keywords", field::kKOVAMDKeywords},
    {"Iptc.Application2.Byline", field::kKOVAMDAuthors},
    {"Iptc.Application2.Copyright", field::kKOVAMDCopyright},
    {"Iptc.Application2.SpecialInstructions", field::kKOVAMDInstructions},
    {"Iptc.Application2.SubLocation", field::kKOVAMDNamedLocation},
    {"Iptc.Application2.City", field::kKOVAMDCity},
    {"Iptc.Application2.ProvinceState", field::kKOVAStateOrProvince},
    {"Iptc.Application2.CountryName", field::kKOVAMDCountry},
};

constexpr PhotoRow kXmpRows[] = {
    {"Xmp.dc.title", field::kKOVAMDTitle},
    {"Xmp.photoshop.Headline", field::kKOVAMDHeadline},
    {"Xmp.dc.description", field::kKOVAMDDescription},
    {"Xmp.dc.subject", field::kKOVAMDKeywords},
    {"Xmp.dc.creator", field::kKOVAMDAuthors},
    {"Xmp.dc.rights", field::kKOVAMDCopyright},
    {"Xmp.photoshop.Instructions", field::kKOVAMDInstructions},
    {"Xmp.iptc.Location", field::kKOVAMDNamedLocation},
    {"Xmp.photoshop.City", field::kKOVAMDCity},
    {"Xmp.photoshop.State", field::kKOVAStateOrProvince},
    {"Xmp.photoshop.Country", field::kKOVAMDCountry},
    {"Xmp.iptcExt.PersonInImage", field::kKOVAMDPeopleDisplayName},
    {"Xmp.xmp.Rating", field::kKOVAMDStarRating},
    {"Xmp.xmp.CreatorTool", field::kKOVAMDCreator},
};

constexpr PhotoRow kCopiedRows[] = {
    {"Xmp.tiff.Make", field::kKOVAMDAcquisitionMake},
    {"Xmp.tiff.Model", field::kKOVAMDAcquisitionModel},
    {"Xmp.exif.UserComment", field::kKOVAMDComment},
};

/// Fields of several values, to which each source adds.
bool IsList(const std::string& name) {
  return name == field::kKOVAMDKeywords || name == field::kKOVAMDAuthors || name == field::kKOVAMDPeopleDisplayName;
}

/// Without blanks at the end, which cameras fill up with; what is not UTF-8 is read as Latin-1, unless it looks like
/// Cyrillic or East Asian text.
std::string Cleaned(std::string text) {
  text.resize(text.find_last_not_of(std::string_view("\0 \t\r\n", 5)) + 1);
  const std::string clean = Utf8OrLatin1(text);
  const std::string encoding = clean != text ? TrueEncoding(clean) : std::string();
  return encoding.empty() ? clean : InTrueEncoding(clean, encoding);
}

}  // namespace

std::span<const PhotoRow> ExifRows() { return kExifRows; }
std::span<const PhotoRow> IptcRows() { return kIptcRows; }
std::span<const PhotoRow> XmpRows() { return kXmpRows; }
std::span<const PhotoRow> CopiedRows() { return kCopiedRows; }

void PhotoFields::Add(const char* field, const std::string& text) {
  const std::string clean = Cleaned(text);
  if (clean.empty()) return;
  if (IsList(field)) return findings_.Append(field, clean);
  if (values_.isMember(field)) return;
  values_[field] = clean;
  findings_.Set(field, clean);
}

}  // namespace ferrox::extract
