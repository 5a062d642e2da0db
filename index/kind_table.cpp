// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/kind_table.h"

namespace fileindexd {

namespace {

// Text, markup and data, source code, office, pages and books, mail, archives.
constexpr std::string_view DOCUMENTS =
    "txt text log md markdown mkd mdown rst asc adoc asciidoc org tex latex ltx bib sty cls dtx "
    "nfo readme diz me csv tsv tab srt sub vtt ass ssa po pot strings man roff texi texinfo wiki "
    "mediawiki textile ics vcs vcf vcard ldif diff patch gpx kml html htm xhtml xht shtml mht "
    "mhtml maff xml xsl xslt xsd dtd rng svg svgz json jsonl ndjson json5 geojson yaml yml toml "
    "ini cfg conf config properties env plist reg rss atom opml ttl rdf owl wsdl xmp css scss "
    "sass less styl desktop service inf c h cc cpp cxx c++ hh hpp hxx h++ inl ipp tpp m mm cs fs "
    "fsx fsi vb vbs bas java kt kts scala sc groovy gradle clj cljs cljc edn py pyw pyi pyx ipynb "
    "rb erb rake gemspec pl pm pod t php php3 php4 php5 phtml js mjs cjs jsx tsx coffee vue "
    "svelte go rs swift d di dart lua r rmd jl hs lhs ml mli erl hrl ex exs elm lisp lsp cl el "
    "scm ss rkt asm s nasm f for f77 f90 f95 f03 f08 pas pp dpr lpr ada adb ads cob cbl v sv svh "
    "vhd vhdl tcl tk sh bash zsh csh ksh fish bat cmd ps1 psm1 psd1 awk sed sql ddl prolog proto "
    "thrift graphql gql cmake mk mak make dockerfile tf hcl nix zig nim cr pde ino glsl vert frag "
    "hlsl cu cuh y l yy ll qml ui asp aspx jsp jspx cfm ejs hbs mustache twig haml pug "
    "applescript as mxml hx gd sol vim doc docx docm dot dotx dotm odt ott fodt odm sxw stw rtf "
    "wps wpd wri pages abw zabw hwp hwpx lwp sdw uot gdoc xls xlsx xlsm xlsb xlt xltx xltm ods "
    "ots fods sxc stc numbers gnumeric wk1 wk3 wk4 wks 123 dif slk uos gsheet ppt pptx pptm pps "
    "ppsx ppsm potx potm odp otp fodp sxi sti key uop gslides odg otg fodg sxd odf odb odc mdb "
    "accdb vsd vsdx vss vst vdx mpp pub one onepkg xmind dia drawio pdf xps oxps ps eps dvi djvu "
    "djv epub mobi azw azw3 azw4 prc fb2 fbz lit lrf pdb chm hlp cbz cbr cb7 cbt indd idml eml "
    "emlx msg oft mbox mbx pst ost dbx tnef p7m zip zipx rar 7z tar gz tgz bz2 tbz tbz2 xz txz "
    "zst tzst lz lzma tlz lz4 lzo z taz cpio ar arj ace lha lzh cab iso dmg wim jar war ear apk "
    "xpi crx deb rpm pkg msi shar sit sitx hqx br udf";

constexpr std::string_view AUDIOS =
    "mp3 mp2 mp1 mpga m4a m4b m4p m4r aac adts flac fla ogg oga opus spx wav wave w64 rf64 bwf "
    "aif aiff aifc au snd wma ape wv wvp mpc mp+ tta tak ofr shn alac caf amr awb 3ga ac3 eac3 "
    "dts dtshd mlp thd dsf dff dsd ra ram mid midi kar rmi mod xm it s3m mka weba voc gsm qcp aa "
    "aax m3u m3u8 pls cue xspf sf2 vox rmj";

constexpr std::string_view VIDEOS =
    "mp4 m4v mp4v mov qt avi divx xvid mkv mk3d webm wmv asf flv f4v f4p mpg mpeg mpe m1v m2v mpv "
    "mpv2 mp2v vob evo ifo ts tp trp m2t m2ts mts tod 3gp 3gpp 3g2 3gp2 ogv ogm ogx rm rmvb rv dv "
    "mxf gxf nut nsv amv dvr-ms wtv bik smk roq viv y4m yuv ivf h264 264 h265 265 hevc avc av1 "
    "vp8 vp9 mjpg mjpeg mj2 swf flc fli insv lrv braw r3d";

// Pictures of every sort, and the raw formats of cameras.
constexpr std::string_view PHOTOS =
    "jpg jpeg jpe jfif jif jp2 j2k jpf jpx jpm jpc j2c jxl jxr hdp wdp jls png apng mng jng gif "
    "bmp dib rle tif tiff btf webp heic heif heics heifs hif avif avifs ico cur icns tga vda icb "
    "pcx dcx pbm pgm ppm pnm pam pfm xbm xpm xwd ras sgi rgb rgba bw psd psb xcf kra ora clip ai "
    "cdr wmf emf emz wmz cgm exr hdr pic pct pict iff lbm dds fits fit fts dcm dicom mpo qoi wbmp "
    "fpx pcd sketch afphoto raw dng cr2 cr3 crw nef nrw arw sr2 srf srw orf ori raf rw2 rwl rwz "
    "pef ptx dcr kdc k25 dcs drf 3fr fff iiq cap eip mef mos mrw erf bay x3f gpr mdc cine";

}  // namespace

std::string_view DocumentEndings() {
  return DOCUMENTS;
}
std::string_view AudioEndings() {
  return AUDIOS;
}
std::string_view VideoEndings() {
  return VIDEOS;
}
std::string_view PhotoEndings() {
  return PHOTOS;
}

}  // namespace fileindexd
