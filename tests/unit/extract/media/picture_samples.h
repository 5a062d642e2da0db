// SPDX-License-Identifier: GPL-2.0-or-later
// Small pictures of 64 by 48 pixels, with the metadata of one photo where the format has any.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tests/unit/extract/media/sample.h"

namespace fileindexd {

// Taken on 2003-01-02 at 10:11:12 of its clock, with a "NIKON D70" of "NIKON
// CORPORATION" through an "AF-S 18-70mm", at 48° 12' 30.15" N, 11° 30' W; caption "Grüße vom Berg".
constexpr int64_t PHOTO_TAKEN = 1041502272;
constexpr int64_t PHOTO_LATITUDE = 482083750;
constexpr int64_t PHOTO_LONGITUDE = -115000000;

// Made by hand: metadata in the structure of TIFF, which other formats hold too, its pixels
// counted, its first directory at `directory`. The header is what stands before that.
std::string TiffBytes(const std::string& header);
std::string PlainTiffHeader();

Sample TiffSample();
std::vector<Sample> RawSamples();  // dng, nef, arw, pef, cr2, orf, rw2
Sample RafSample();
Sample MrwSample();
Sample Cr3Sample();
// Taken then by a clock without a zone, with a "Canon EOS 10D", and no more.
Sample CrwSample();
Sample HeicSample();

// With all three sorts of metadata, by the library's writer: title "Titel", author "Zoë", keywords
// "Berg", "Tal" (twice, in XMP and IPTC) and a rating of 4 too.
Sample JpegSample();
Sample PngSample();
Sample WebpSample();

// Without metadata.
Sample GifSample();
Sample BmpSample();
std::string PlainJpeg();

// With a comment of the file, "Grüße", and nothing else.
std::vector<Sample> CommentedSamples();
// Of a Canon that wrote its lens down as number 1 in its own notes.
Sample NotedLensSample();

std::vector<Sample> PictureSamples();

}  // namespace fileindexd
