// SPDX-License-Identifier: GPL-2.0-or-later
#include <algorithm>
#include <array>
#include <unordered_map>

#include "base/ascii.h"
#include "extract/choice.h"

namespace fileindexd {

namespace {

// Endings without the dot, lower case, a blank between two.
struct EndingRow {
  Format format;
  std::string_view endings;
};

constexpr EndingRow ENDINGS[] = {
    {Format::TEXT,
     "txt text log md markdown mkd mdown rst asc adoc asciidoc org tex latex ltx bib sty cls dtx "
     "nfo readme diz me csv tsv tab srt sub vtt ass ssa po pot strings man roff texi texinfo wiki "
     "mediawiki textile ics vcs vcf vcard ldif diff patch json jsonl ndjson json5 geojson yaml yml "
     "toml ini cfg conf config properties env reg ttl css scss sass less styl desktop service inf "
     "c h cc cpp cxx c++ hh hpp hxx h++ inl ipp tpp m mm cs fs fsx fsi vb vbs bas java kt kts "
     "scala sc groovy gradle clj cljs cljc edn py pyw pyi pyx ipynb rb erb rake gemspec pl pm pod "
     "t php php3 php4 php5 phtml js mjs cjs jsx tsx coffee vue svelte go rs swift d di dart lua r "
     "rmd jl hs lhs ml mli erl hrl ex exs elm lisp lsp cl el scm ss rkt asm s nasm f for f77 f90 "
     "f95 f03 f08 pas pp dpr lpr ada adb ads cob cbl v sv svh vhd vhdl tcl tk sh bash zsh csh ksh "
     "fish bat cmd ps1 psm1 psd1 awk sed sql ddl prolog proto thrift graphql gql cmake mk mak make "
     "dockerfile tf hcl nix zig nim cr pde ino glsl vert frag hlsl cu cuh y l yy ll qml asp aspx "
     "jsp jspx cfm ejs hbs mustache twig haml pug applescript as gd sol vim dif slk drawio m3u "
     "m3u8 pls cue"},
    {Format::HTML, "html htm xhtml xht shtml"},
    {Format::XML,
     "xml xsl xslt xsd dtd rng svg gpx kml plist rss atom opml rdf owl wsdl xmp ui mxml hx "
     "fb2 abw uot uos uop vdx dia xspf"},
    {Format::PDF, "pdf"},
    {Format::OFFICE_ZIP,
     "docx docm dotx dotm xlsx xlsm xltx xltm pptx pptm ppsx ppsm potx potm odt ott odm ods ots "
     "odp otp odg otg odf fodt fods fodp fodg"},
    {Format::EPUB, "epub"},
    {Format::OLD_OFFICE, "doc dot xls xlt ppt pps pot"},
    {Format::RTF, "rtf"},
    {Format::MESSAGE, "eml emlx mht mhtml"},
    {Format::MAILBOX, "mbox mbx"},
    {Format::ARCHIVE,
     "zip zipx rar 7z tar gz tgz bz2 tbz tbz2 xz txz zst tzst lz lzma tlz lz4 z taz cpio ar "
     "lha lzh cab iso jar war ear apk xpi deb rpm udf cbz cbr cb7 cbt svgz zabw fbz maff gnumeric"},
    {Format::AUDIO,
     "mp3 mp2 mp1 mpga m4a m4b m4p m4r aac flac fla ogg oga opus spx wav wave rf64 bwf aif aiff "
     "aifc wma ape wv mpc mp+ tta"},
    {Format::VIDEO,
     "mp4 m4v mp4v mov qt avi divx xvid mkv mk3d webm wmv asf flv f4v mpg mpeg mpe m1v m2v mpv "
     "mp2v "
     "vob evo ts tp trp m2t m2ts mts tod 3gp 3gpp 3g2 3gp2 ogv ogm ogx rm rmvb dv mxf mka weba "
     "ac3 eac3 dts amr"},
    {Format::PHOTO,
     "jpg jpeg jpe jfif jif png tif tiff webp heic heif heics heifs hif avif avifs gif bmp dib jp2 "
     "psd tga pgf raw dng cr2 cr3 crw nef nrw arw sr2 srf srw orf raf rw2 rwl pef ptx dcr kdc 3fr "
     "fff iiq mef mos mrw erf x3f mpo jpf jpx jpm"},
};

struct MimeRow {
  std::string_view prefix;
  Format format;
};

// The first that fits counts.
constexpr MimeRow MIMES[] = {
    {"text/html", Format::HTML},
    {"application/xhtml+xml", Format::HTML},
    {"text/xml", Format::XML},
    {"application/xml", Format::XML},
    {"image/svg+xml", Format::XML},
    {"application/pdf", Format::PDF},
    {"text/rtf", Format::RTF},
    {"application/rtf", Format::RTF},
    {"application/mbox", Format::MAILBOX},
    {"message/", Format::MESSAGE},
    {"text/", Format::TEXT},
    {"application/json", Format::TEXT},
    {"application/x-ndjson", Format::TEXT},
    {"application/javascript", Format::TEXT},
    {"application/x-wine-extension-ini", Format::TEXT},
    {"application/x-setupscript", Format::TEXT},
    {"application/csv", Format::TEXT},
    {"application/x-subrip", Format::TEXT},
    {"application/vnd.openxmlformats-officedocument", Format::OFFICE_ZIP},
    {"application/vnd.oasis.opendocument", Format::OFFICE_ZIP},
    {"application/epub+zip", Format::EPUB},
    {"application/msword", Format::OLD_OFFICE},
    {"application/vnd.ms-excel", Format::OLD_OFFICE},
    {"application/vnd.ms-powerpoint", Format::OLD_OFFICE},
    {"application/vnd.ms-office", Format::OLD_OFFICE},
    {"application/x-ole-storage", Format::OLD_OFFICE},
    {"application/CDFV2", Format::OLD_OFFICE},
    {"application/zip", Format::ARCHIVE},
    {"application/x-zip", Format::ARCHIVE},
    {"application/java-archive", Format::ARCHIVE},
    {"application/x-tar", Format::ARCHIVE},
    {"application/gzip", Format::ARCHIVE},
    {"application/x-gzip", Format::ARCHIVE},
    {"application/x-bzip2", Format::ARCHIVE},
    {"application/x-xz", Format::ARCHIVE},
    {"application/x-lzma", Format::ARCHIVE},
    {"application/x-lzip", Format::ARCHIVE},
    {"application/x-lz4", Format::ARCHIVE},
    {"application/zstd", Format::ARCHIVE},
    {"application/x-zstd", Format::ARCHIVE},
    {"application/x-compress", Format::ARCHIVE},
    {"application/x-7z-compressed", Format::ARCHIVE},
    {"application/x-rar", Format::ARCHIVE},
    {"application/vnd.rar", Format::ARCHIVE},
    {"application/x-cpio", Format::ARCHIVE},
    {"application/x-archive", Format::ARCHIVE},
    {"application/vnd.debian.binary-package", Format::ARCHIVE},
    {"application/x-rpm", Format::ARCHIVE},
    {"application/vnd.ms-cab-compressed", Format::ARCHIVE},
    {"application/x-lzh", Format::ARCHIVE},
    {"application/x-lha", Format::ARCHIVE},
    {"application/x-iso9660-image", Format::ARCHIVE},
    {"audio/mpeg", Format::AUDIO},
    {"audio/mp4", Format::AUDIO},
    {"audio/x-m4a", Format::AUDIO},
    {"audio/flac", Format::AUDIO},
    {"audio/x-flac", Format::AUDIO},
    {"audio/ogg", Format::AUDIO},
    {"application/ogg", Format::AUDIO},
    {"audio/x-wav", Format::AUDIO},
    {"audio/vnd.wave", Format::AUDIO},
    {"audio/x-aiff", Format::AUDIO},
    {"audio/aiff", Format::AUDIO},
    {"audio/x-ape", Format::AUDIO},
    {"audio/x-musepack", Format::AUDIO},
    {"audio/x-wavpack", Format::AUDIO},
    {"audio/x-hx-aac-adts", Format::AUDIO},
    {"audio/x-ms-wma", Format::AUDIO},
    {"video/x-ms-asf", Format::VIDEO},
    {"video/", Format::VIDEO},
    {"application/vnd.rn-realmedia", Format::VIDEO},
    {"application/mxf", Format::VIDEO},
    {"image/jpeg", Format::PHOTO},
    {"image/png", Format::PHOTO},
    {"image/tiff", Format::PHOTO},
    {"image/webp", Format::PHOTO},
    {"image/heic", Format::PHOTO},
    {"image/heif", Format::PHOTO},
    {"image/avif", Format::PHOTO},
    {"image/gif", Format::PHOTO},
    {"image/bmp", Format::PHOTO},
    {"image/x-ms-bmp", Format::PHOTO},
    {"image/jp2", Format::PHOTO},
    {"image/vnd.adobe.photoshop", Format::PHOTO},
    {"image/x-canon-cr2", Format::PHOTO},
    {"image/x-canon-crw", Format::PHOTO},
    {"image/x-nikon", Format::PHOTO},
    {"image/x-sony", Format::PHOTO},
    {"image/x-olympus-orf", Format::PHOTO},
    {"image/x-fuji-raf", Format::PHOTO},
    {"image/x-panasonic-rw2", Format::PHOTO},
    {"image/x-pentax-pef", Format::PHOTO},
    {"image/x-minolta-mrw", Format::PHOTO},
    {"image/x-sigma-x3f", Format::PHOTO},
};

using EndingMap = std::unordered_map<std::string_view, Format>;

EndingMap MakeEndingMap() {
  EndingMap map;
  for (const EndingRow& row : ENDINGS) {
    std::string_view endings = row.endings;
    while (!endings.empty()) {
      const size_t blank = endings.find(' ');
      map.emplace(endings.substr(0, blank), row.format);
      endings.remove_prefix(blank == std::string_view::npos ? endings.size() : blank + 1);
    }
  }
  return map;
}

}  // namespace

Format FormatOfName(std::string_view name) {
  static const EndingMap endings = MakeEndingMap();
  constexpr size_t LONGEST = 16;

  const size_t dot = name.rfind('.');
  if (dot == std::string_view::npos || dot == 0 || name.size() - dot - 1 > LONGEST) {
    return Format::NONE;
  }

  std::array<char, LONGEST> lower{};
  const std::string_view ending = name.substr(dot + 1);
  std::transform(ending.begin(), ending.end(), lower.begin(), LowerLetter);
  const auto found = endings.find(std::string_view(lower.data(), ending.size()));
  return found == endings.end() ? Format::NONE : found->second;
}

Format FormatOfMime(std::string_view mime) {
  const auto* found = std::find_if(std::begin(MIMES), std::end(MIMES), [mime](const MimeRow& row) {
    return mime.starts_with(row.prefix);
  });
  return found == std::end(MIMES) ? Format::NONE : found->format;
}

}  // namespace fileindexd
