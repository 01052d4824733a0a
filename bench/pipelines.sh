#!/bin/sh
# The file reports as a shell user would make them, the peer of bench/reports.py:
# pipelines.sh FOLDER OUTPUT-FOLDER [once]
#
# The size of each share (first folder), the 10000 largest, the 10000 longest and the 10000 last
# changed, number and size by owner and by ending, and the files of equal name and size. Each is a
# pipeline that begins with find; with "once" they share one list of all files.
set -eu
export LC_ALL=C
cd "$1"
out=$2
tab=$(printf '\t')

files() {
  find . -type f -printf '%s\t%T@\t%U\t%f\t%P\n'
}
if [ "${3-}" = once ]; then
  files >"$out/list"
  files() {
    cat "$out/list"
  }
fi

old=$(($(date +%s) - 90 * 86400))
new=$(($(date +%s) - 7 * 86400))

files | awk -F "$tab" '{ share = $5; sub("/.*", "", share); size[share] += $1 }
  END { for (share in size) print size[share] "\t" share }' | sort -rn >"$out/shares"
files | sort -t "$tab" -k1,1rn | head -n 10000 | cut -f 1,5 >"$out/largest"
files | awk -F "$tab" -v old="$old" '$2 < old' | sort -t "$tab" -k2,2n | head -n 10000 |
  cut -f 1,2,5 >"$out/least"
files | awk -F "$tab" -v new="$new" '$2 > new' | sort -t "$tab" -k2,2rn | head -n 10000 |
  cut -f 1,2,5 >"$out/most"
files | awk -F "$tab" '{ share = $5; sub("/.*", "", share); key = $3 "\t" share; ++files[key]
    size[key] += $1 }
  END { for (key in files) print key "\t" files[key] "\t" size[key] }' |
  sort -t "$tab" -k1,1n -k4,4rn >"$out/owners"
files | awk -F "$tab" '{ share = $5; sub("/.*", "", share); type = tolower($4)
    if (!sub(".*[.]", "", type)) type = ""
    size[type "\t" share] += $1 }
  END { for (key in size) print key "\t" size[key] }' | sort >"$out/types"
files | sort -t "$tab" -k1,1rn -k4,4 | awk -F "$tab" '
  $1 == size && $4 == name { if (first != "") { ++group; print group "\t" first; first = "" }
    print group "\t" $0; next }
  { size = $1; name = $4; first = $0 }' >"$out/duplicates"
