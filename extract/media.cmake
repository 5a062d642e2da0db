# SPDX-License-Identifier: GPL-2.0-or-later
# Readers of sound, film and pictures.
find_package(PkgConfig REQUIRED)
pkg_check_modules(TAGLIB REQUIRED IMPORTED_TARGET GLOBAL taglib)
pkg_check_modules(MEDIAINFO REQUIRED IMPORTED_TARGET libmediainfo)
pkg_check_modules(EXIV2 REQUIRED IMPORTED_TARGET GLOBAL exiv2)

add_library(extract_media STATIC
  audio.cpp
  audio_format.cpp
  audio_stream.cpp
  audio_tags.cpp
  bmff_items.cpp
  gif_comment.cpp
  media_text.cpp
  photo.cpp
  photo_fields.cpp
  photo_values.cpp
  track_format.cpp
  tracks.cpp
  video.cpp)
target_link_libraries(extract_media
  PUBLIC extract_answer
  PRIVATE project_flags PkgConfig::TAGLIB PkgConfig::MEDIAINFO PkgConfig::EXIV2)
check_headers(extract_media
  audio_format.h
  audio_stream.h
  audio_tags.h
  bmff_items.h
  gif_comment.h
  media_text.h
  photo_fields.h
  photo_values.h
  track_format.h
  tracks.h)
