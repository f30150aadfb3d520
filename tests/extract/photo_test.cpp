#include "services/kovacontentextractd/readers/photo/photo.h"

#include <exiv2/exiv2.hpp>

#include <gtest/gtest.h>

#include "tests/extract/reader_support.h"

namespace ferrox::extract::test {

namespace {

/// The smallest pictures that the library writes metadata into, 640 x 480.
std::string Jpeg() {
  return std::string("\xFF\xD8\xFF\xC0\x00\x0B\x08\x01\xE0\x02\x80\x01\x01\x11\x00", 15) +
         std::string("\xFF\xDA\x00\x08\x01\x01\x00\x00\x3F\x00\x00\xFF\xD9", 13);
}

std::string Png() {
  return std::string("\x89PNG\r\n\x1A\n\0\0\0\rIHDR\0\0\x02\x80\0\0\x01\xE0\x08\x02\0\0\0", 29) +
         std::string("\xE8\x93\x7D\x38\0\0\0\0IEND\xAE\x42\x60\x82", 16);
}

std::string Webp() {
  const std::string payload("\x30\x01\0\x9D\x01\x2A\x80\x02\xE0\x01\0\0", 12);
  return "RIFF" + Little(12 + payload.size(), 4) + "WEBPVP8 " + Little(payload.size(), 4) + payload;
}

std::string Tiff() {
  return std::string("II*\0\x08\0\0\0\x02\0", 10) + std::string("\x00\x01\x03\0\x01\0\0\0\x80\x02\0\0", 12) +
         std::string("\x01\x01\x03\0\x01\0\0\0\xE0\x01\0\0\0\0\0\0", 16);
}

std::string Box(const std::string& name, const std::string& content) {
  return Big(content.size() + 8, 4) + name + content;
}

/// A HEIF file that holds nothing but EXIF, as item 1.
std::string Heif() {
  const std::string exif =
      Big(0, 4) + std::string("II*\0\x08\0\0\0\x01\0", 10) + std::string("\x10\x01\x02\0\x04\0\0\0K1\0\0\0\0\0\0", 16);
  const std::string item = Box("infe", Big(0x02000000, 4) + Big(1, 2) + Big(0, 2) + "Exif" + '\0');
  const auto meta = [&](size_t offset) {
    const std::string place = Big(0, 4) + Big(0x4400, 2) + Big(1, 2) + Big(1, 2) + Big(0, 2) + Big(1, 2) +
                              Big(offset, 4) + Big(exif.size(), 4);
    return Box("meta", Big(0, 4) + Box("hdlr", Big(0, 8) + "pict" + Big(0, 13)) +
                           Box("iinf", Big(0, 4) + Big(1, 2) + item) + Box("iloc", place) +
                           Box("iprp", Box("ipco", Box("ispe", Big(0, 4) + Big(4032, 4) + Big(3024, 4)))));
  };
  const std::string begin = Box("ftyp", "heic" + Big(0, 4) + "mif1heic");
  return begin + meta(begin.size() + meta(0).size() + 8) + Box("mdat", exif);
}

/// The picture with what a camera, and then a person, put into it.
std::string WithMetadata(const std::string& picture) {
  PreparePhoto();
  const auto image = Exiv2::ImageFactory::open(reinterpret_cast<const Exiv2::byte*>(picture.data()),
                                               static_cast<long>(picture.size()));
  image->readMetadata();
  Exiv2::ExifData& exif = image->exifData();
  exif["Exif.Image.Make"] = "Kamerawerk  ";
  exif["Exif.Image.Model"] = "K 100";
  exif["Exif.Image.Orientation"] = uint16_t(6);
  exif["Exif.Photo.DateTimeOriginal"] = "2023:07:14 18:30:00";
  exif["Exif.Photo.OffsetTimeOriginal"] = "+02:00";
  exif["Exif.Photo.ExposureTime"] = Exiv2::URational(1, 250);
  exif["Exif.Photo.FNumber"] = Exiv2::URational(28, 10);
  exif["Exif.Photo.FocalLength"] = Exiv2::URational(35, 1);
  exif["Exif.Photo.ISOSpeedRatings"] = uint16_t(400);
  exif["Exif.Photo.UserComment"] = "charset=Unicode Море";
  exif["Exif.Photo.Flash"] = uint16_t(1);
  image->iptcData()["Iptc.Application2.City"] = "Paris";
  image->iptcData()["Iptc.Application2.CountryName"] = "France";
  image->xmpData()["Xmp.dc.title"] = "lang=x-default Fête à la plage";
  image->xmpData()["Xmp.dc.subject"] = "sommer";
  image->xmpData()["Xmp.dc.subject"] = "море";
  image->xmpData()["Xmp.photoshop.City"] = "東京";
  image->writeMetadata();
  Exiv2::BasicIo& io = image->io();
  io.open();
  const Exiv2::DataBuf bytes = io.read(static_cast<long>(io.size()));
  return {reinterpret_cast<const char*>(bytes.pData_), static_cast<size_t>(bytes.size_)};
}

}  // namespace

TEST(PhotoTest, WhatCamerasAndPeoplePutIntoPictures) {
  for (const auto& [extension, picture] : Members{{"jpg", Jpeg()}, {"png", Png()}, {"webp", Webp()}, {"tif", Tiff()}}) {
    SCOPED_TRACE(extension);
    const Json::Value document = Read(&ReadPhoto, WithMetadata(picture), extension);
    EXPECT_EQ("Kamerawerk", Text(document, "KOVAMDAcquisitionMake"));
    EXPECT_EQ("K 100", Text(document, "KOVAMDAcquisitionModel"));
    EXPECT_EQ(6, document["KOVAMDOrientation"].asInt());
    EXPECT_EQ(1689352200, document["KOVAMDContentCreationDate"].asInt64());
    EXPECT_EQ("1/250", Text(document, "KOVAMDExposureTimeString"));
    EXPECT_NEAR(0.004, document["KOVAMDExposureTimeSeconds"].asDouble(), 1e-6);
    EXPECT_EQ("F2.8", Text(document, "KOVAMDAperture"));
    EXPECT_EQ(35, document["KOVAMDFocalLength"].asDouble());
    EXPECT_EQ(400, document["KOVAMDISOSpeed"].asInt());
    EXPECT_EQ(1, document["KOVAMDFlashOnOff"].asInt());
    EXPECT_EQ("Море", Text(document, "KOVAMDComment"));
    EXPECT_EQ(640, document["KOVAMDPixelWidth"].asInt());
    EXPECT_EQ(480, document["KOVAMDPixelHeight"].asInt());
    EXPECT_EQ("Fête à la plage", Text(document, "KOVAMDTitle"));
    EXPECT_EQ("sommer, море", Text(document, "KOVAMDKeywords"));
    const bool has_iptc = extension != "webp";
    EXPECT_EQ(has_iptc ? "東京, France" : "東京", Text(document, "KOVAMDNamedLocation"));
    EXPECT_EQ("", Text(document, "_KOVAExtractError"));
  }
}

TEST(PhotoTest, HeifHasItsExifInAnItem) {
  const Json::Value document = Read(&ReadPhoto, Heif(), "heic");
  EXPECT_EQ("K1", Text(document, "KOVAMDAcquisitionModel"));
  EXPECT_EQ(4032, document["KOVAMDPixelWidth"].asInt());
  EXPECT_EQ(3024, document["KOVAMDPixelHeight"].asInt());
}

TEST(PhotoTest, DamageIsBorne) {
  EXPECT_EQ("damaged", Text(Read(&ReadPhoto, "no picture", "jpg"), "_KOVAExtractError"));
  std::string png = WithMetadata(Png());
  const Json::Value document = Read(&ReadPhoto, png.substr(0, png.size() / 2), "png");
  EXPECT_EQ("damaged", Text(document, "_KOVAExtractError"));
  EXPECT_EQ(640, document["KOVAMDPixelWidth"].asInt());
  Abuse(&ReadPhoto, Heif(), "heic");
  Abuse(&ReadPhoto, WithMetadata(Jpeg()), "jpg");
  Abuse(&ReadPhoto, WithMetadata(Png()), "png");
  Abuse(&ReadPhoto, WithMetadata(Webp()), "webp");
  Abuse(&ReadPhoto, WithMetadata(Tiff()), "tif");
}

}  // namespace ferrox::extract::test
