// What kind of file an extension stands for.
#include <algorithm>
#include <array>
#include <cerrno>
#include <string>
#include <string_view>

#include "base/text_containers.hpp"
#include "vorn/report.h"

namespace {

struct FileType {
  std::string_view label;
  std::string_view extensions;  // separated by single blanks
};

// Ambiguous ones stand where file servers have them most: ts is video, not TypeScript.
constexpr std::array kFileTypes{
    FileType{"document", "doc docx docm dot dotx odt ott fodt rtf pdf ps xps wpd wps pages tex"},
    FileType{"spreadsheet", "xls xlsx xlsm xlsb xlt xltx ods ots fods csv tsv numbers gnumeric"},
    FileType{"presentation", "ppt pptx pptm pps ppsx pot potx odp otp fodp key"},
    FileType{"text", "txt md rst asc adoc nfo readme me ini cfg conf yaml yml toml json srt vtt"},
    FileType{"image",
             "jpg jpeg jpe jfif png gif bmp tif tiff webp heic heif avif svg svgz ico psd psb xcf "
             "ai eps raw cr2 cr3 nef nrw arw srf sr2 orf rw2 raf dng pef x3f jp2 jxl tga exr hdr"},
    FileType{"audio",
             "mp3 wav flac aac ogg oga opus m4a m4b wma aif aiff ape alac amr mid midi mka dsf"},
    FileType{"video",
             "mp4 m4v mkv avi mov wmv flv webm mpg mpeg m2v vob ts m2ts mts 3gp 3g2 ogv rm rmvb "
             "divx asf mxf"},
    FileType{"archive",
             "zip zipx rar 7z tar gz tgz bz2 tbz tbz2 xz txz zst lz lz4 lzma z cab arj lha jar "
             "war deb rpm apk cpio"},
    FileType{"disk_image",
             "iso img vmdk vdi vhd vhdx qcow qcow2 dmg nrg ova ovf avhdx vmem wim squashfs"},
    FileType{"database",
             "db sqlite sqlite3 db3 mdb accdb mdf ldf ndf dbf ibd frm myd myi fdb pst ost odb"},
    FileType{"source",
             "c h cc cpp cxx hpp hh java kt kts py ipynb rb go rs js mjs jsx tsx cs vb fs swift m "
             "mm pl pm php lua r jl sql sh bash zsh ps1 bat cmd asm s pas f90 scala hs erl ex"},
    FileType{"executable", "exe msi dll so dylib sys bin com elf o a lib appimage class pyc run"},
    FileType{"font", "ttf otf ttc woff woff2 pfb pfm fon"},
    FileType{"mail", "eml msg mbox emlx mbx vcf ics"},
    FileType{"backup", "bak bkf old orig bkp vbk vib vrb tib gho dump"},
    FileType{"web", "html htm xhtml xml xsl css scss less asp aspx jsp url webloc mht mhtml"},
    FileType{"drawing",
             "dwg dxf dwt dwf dgn skp step stp iges igs stl obj 3ds 3mf fbx blend max ipt iam "
             "sldprt sldasm catpart rvt ifc vsd vsdx odg cdr"},
    FileType{"ebook", "epub mobi azw azw3 fb2 djvu djv cbr cbz lit"},
    FileType{"log", "log trace evtx evt pcap pcapng etl"},
    FileType{"temporary", "tmp temp swp swo part partial crdownload lock cache"},
};

}  // namespace

int VornQazInitFileTypeHash(VLIBCSzHash** hash) try {
  if (hash == nullptr || *hash == nullptr) {
    errno = EINVAL;
    return -1;
  }
  int count = 0;
  for (const auto& [label, extensions] : kFileTypes) {
    const std::string value = "reportUI_file_type_" + std::string(label);
    for (std::string_view rest = extensions; !rest.empty();) {
      const std::size_t end = std::min(rest.find(' '), rest.size());
      (*hash)->set(rest.substr(0, end), value);
      rest.remove_prefix(std::min(end + 1, rest.size()));
      ++count;
    }
  }
  (*hash)->fold_case();
  return count;
} catch (...) {
  errno = ENOMEM;
  return -1;
}
