// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/media/picture_samples.h"

#include <exiv2/exiv2.hpp>

#include "tests/unit/extract/media/bytes.h"
#include "tests/unit/extract/media/tiff_bytes.h"

namespace fileindexd {

namespace {

const char* const CAPTION = "Grüße vom Berg";

std::string Written(Exiv2::Image& image) {
  image.writeMetadata();
  Exiv2::BasicIo& written = image.io();
  written.open();
  std::string bytes(written.size(), '\0');
  written.read(reinterpret_cast<Exiv2::byte*>(bytes.data()), static_cast<long>(bytes.size()));
  return bytes;
}

// Adds all three sorts of metadata.
std::string Described(const std::string& plain) {
  Exiv2::XmpParser::initialize();
  Exiv2::Image::AutoPtr image = Exiv2::ImageFactory::open(
      reinterpret_cast<const Exiv2::byte*>(plain.data()), static_cast<long>(plain.size()));
  const std::string tiff = TiffBytes(PlainTiffHeader());
  Exiv2::ExifParser::decode(image->exifData(), reinterpret_cast<const Exiv2::byte*>(tiff.data()),
                            static_cast<uint32_t>(tiff.size()));
  Exiv2::XmpData& xmp = image->xmpData();
  xmp["Xmp.dc.description"] = CAPTION;
  xmp["Xmp.dc.title"] = "Titel";
  xmp["Xmp.dc.creator"] = "Zoë";
  xmp["Xmp.xmp.Rating"] = "4";
  const Exiv2::Value::AutoPtr subjects = Exiv2::Value::create(Exiv2::xmpBag);
  subjects->read("Berg");
  subjects->read("Tal");
  xmp.add(Exiv2::XmpKey("Xmp.dc.subject"), subjects.get());
  const Exiv2::Value::AutoPtr keyword = Exiv2::Value::create(Exiv2::string);
  for (const char* word : {"Tal", "Fluß"}) {
    keyword->read(word);
    image->iptcData().add(Exiv2::IptcKey("Iptc.Application2.Keywords"), keyword.get());
  }
  return Written(*image);
}

// As cameras write it: its metadata come directly behind its beginning.
std::string CameraJpeg() {
  const std::string exif = std::string("Exif\0\0", 6) + TiffBytes(PlainTiffHeader());
  return Hex("ffd8 ffe1") + Big(exif.size() + 2, 2) + exif + PlainJpeg().substr(2);
}

std::string PngChunk(const std::string& type, const std::string& payload) {
  return Big(payload.size(), 4) + type + payload + Big(PngChecksum(type + payload), 4);
}

}  // namespace

Sample TiffSample() {
  return {"p.tiff", TiffBytes(PlainTiffHeader())};
}

std::vector<Sample> RawSamples() {
  const std::string plain = TiffBytes(PlainTiffHeader());
  std::vector<Sample> samples;
  for (const char* ending : {"dng", "nef", "arw", "pef"}) {
    samples.push_back({std::string("p.") + ending, plain});
  }
  samples.push_back({"p.cr2", TiffBytes("II*" + Hex("00 10000000") + "CR" + Hex("0200 00000000"))});
  samples.push_back({"p.orf", TiffBytes("IIRO" + Hex("08000000"))});
  const std::string rw2_header = "IIU" + Hex("00 18000000") + std::string(16, '\x0b');
  TiffEntry shown = TiffBytesEntry(0x2e, CameraJpeg());
  shown.type = 7;
  samples.push_back(
      {"p.rw2", TiffFile(rw2_header,
                         {TiffShort(2, 64), TiffShort(3, 48), shown,
                          TiffText(0x10f, "NIKON CORPORATION"), TiffText(0x110, "NIKON D70")},
                         {}, {})});
  return samples;
}

Sample RafSample() {
  // The picture that the camera shows stands in it as a JPEG, which has the metadata.
  const std::string jpeg = CameraJpeg();
  const std::string head = "FUJIFILMCCD-RAW 0201FF383501" + std::string("X-T1").append(28, '\0') +
                           "0100" + std::string(20, '\0');
  std::string places = Big(160, 4) + Big(jpeg.size(), 4);
  const uint64_t behind = 160 + jpeg.size();
  places += Big(behind, 4) + Big(12, 4) + Big(behind + 12, 4) + Big(64, 4);
  std::string bytes = head + places;
  bytes.resize(160, '\0');
  // One field of the raw data's size: height and width.
  bytes += jpeg + Big(1, 4) + Big(0x100, 2) + Big(4, 2) + Big(48, 2) + Big(64, 2);
  return {"p.raf", bytes + std::string(64, '\x05')};
}

Sample HeicSample() {
  const std::string exif = Big(6, 4) + std::string("Exif\0\0", 6) + TiffBytes(PlainTiffHeader());
  const auto item = [](uint64_t number, const std::string& type) {
    return Box("infe", Hex("02000000") + Big(number, 2) + Big(0, 2) + type + std::string(1, '\0'));
  };
  // A grid of tiles that are bigger than what is shown of them; places with a base offset.
  const std::string properties = Box(
      "iprp",
      Box("ipco", Box("ispe", Big(0, 4) + Big(512, 4) + Big(512, 4)) +
                      Box("ispe", Big(0, 4) + Big(64, 4) + Big(48, 4))) +
          Box("ipma", Big(0, 4) + Big(2, 4) + Big(1, 2) + Hex("0101") + Big(2, 2) + Hex("0102")));
  const auto meta = [&](uint64_t place) {
    const std::string places = Hex("01000000 4440") + Big(1, 2) + Big(3, 2) + Big(0, 2) +
                               Big(0, 2) + Big(place, 4) + Big(1, 2) + Big(0, 4) +
                               Big(exif.size(), 4);
    return Box("meta", Big(0, 4) + Box("hdlr", Big(0, 8) + "pict" + std::string(13, '\0')) +
                           Box("pitm", Big(0, 4) + Big(2, 2)) + Box("iloc", places) +
                           Box("iinf", Big(0, 4) + Big(3, 2) + item(1, "hvc1") + item(2, "grid") +
                                           item(3, "Exif")) +
                           properties);
  };
  const std::string type = Box("ftyp", "heic" + Big(0, 4) + "mif1heic");
  const uint64_t place = type.size() + meta(0).size() + 8;
  return {"p.heic", type + meta(place) + Box("mdat", exif)};
}

std::string PlainJpeg() {
  return Hex("ffd8 ffe0 0010 4a46494600 0101 00 0001 0001 0000") +
         Hex("ffc0 000b 08 0030 0040 01 01 11 00") + Hex("ffda 0008 01 01 00 00 3f 00") +
         std::string(64, '\x2a') + Hex("ffd9");
}

Sample JpegSample() {
  return {"p.jpg", Described(PlainJpeg())};
}

Sample PngSample() {
  const std::string plain = Hex("89504e470d0a1a0a") +
                            PngChunk("IHDR", Big(64, 4) + Big(48, 4) + Hex("08 00 00 00 00")) +
                            PngChunk("IDAT", Hex("789c030000000001")) + PngChunk("IEND", "");
  return {"p.png", Described(plain)};
}

Sample WebpSample() {
  // Lossless: sizes less one in 14 bits each.
  const uint64_t size = 63 | 47U << 14;
  const std::string picture = "\x2f" + Little(size, 4) + std::string(40, '\x21');
  return {"p.webp", Described(RiffChunk("RIFF", "WEBP" + RiffChunk("VP8L", picture)))};
}

std::vector<Sample> CommentedSamples() {
  const std::string comment = "Grüße";
  const std::string piece = Little(comment.size(), 1) + comment + Hex("00");
  return {{"c.jpg", PlainJpeg().insert(2, Hex("fffe") + Big(comment.size() + 2, 2) + comment)},
          {"c.gif", GifSample().bytes.insert(13, Hex("21f9 04 00000000 00 21fe") + piece)}};
}

Sample NotedLensSample() {
  const std::string plain = PlainJpeg();
  Exiv2::Image::AutoPtr image = Exiv2::ImageFactory::open(
      reinterpret_cast<const Exiv2::byte*>(plain.data()), static_cast<long>(plain.size()));
  image->exifData()["Exif.Image.Make"] = "Canon";
  image->exifData()["Exif.Image.Model"] = "Canon EOS 10D";
  image->exifData()["Exif.CanonCs.LensType"] = uint16_t{1};
  return {"lens.jpg", Written(*image)};
}

Sample GifSample() {
  return {"p.gif", "GIF89a" + Little(64, 2) + Little(48, 2) +
                       Hex("000000 2c 00000000 4000 3000 00 02 02 4c01 00 3b")};
}

Sample BmpSample() {
  return {"p.bmp", "BM" + Little(154, 4) + Little(0, 4) + Little(54, 4) + Little(40, 4) +
                       Little(64, 4) + Little(48, 4) + Little(1, 2) + Little(24, 2) +
                       std::string(124, '\0')};
}

std::vector<Sample> PictureSamples() {
  std::vector<Sample> samples = RawSamples();
  for (const Sample& sample :
       {JpegSample(), PngSample(), WebpSample(), TiffSample(), HeicSample(), RafSample(),
        GifSample(), BmpSample(), MrwSample(), Cr3Sample(), CrwSample()}) {
    samples.push_back(sample);
  }
  return samples;
}

}  // namespace fileindexd
