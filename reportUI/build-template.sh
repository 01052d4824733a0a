#!/bin/sh
# Builds the frame of the report page around the data blocks that the reports append.
#
# The page stands alone: style, dictionaries and script are put into it. A page is complete when it
# begins with <!DOCTYPE html> and ends with </html>. So that a page that lost a part in between, on a
# disk that was full for a moment, never is: a sub-command that can't write its part of the page
# empties the page, and `tail` ends only a body file whose parts are all there.
set -eu

here=${0%/*}/template

usage() {
  echo "build-template.sh: $1" >&2
  cat >&2 <<'USAGE'
usage: build-template.sh header FILE          starts the page in FILE
       build-template.sh lang FILE CODE       chooses the language CODE (en, de, ...)
       build-template.sh header FILE REPORT   ends the head, after the data blocks
       build-template.sh body FILE            starts the body in FILE
       build-template.sh body FILE REPORT     adds the section of REPORT
       build-template.sh tail FILE            ends the body and the page
       build-template.sh index                makes the list of reports of the data on its input
USAGE
  exit 2
}

fail() {
  echo "build-template.sh: $1" >&2
  exit 1
}

# Writes a part of the page in one piece, behind what is there.
add_to_page() { # FILE TEXT
  printf '%s\n' "$2" >>"$1" || spoil "$1" "it can't be written to"
}

spoil() { # FILE REASON
  : >"$1"
  fail "$1 is no page any more: $2"
}

require_part() { # FILE LAST-LINE...
  part=$1
  [ -f "$part" ] || fail "$part is missing; call the sub-command that starts it first"
  last=$(tail -n 1 -- "$part")
  shift
  for line; do
    case $last in
      "$line"*) return 0 ;;
    esac
  done
  fail "$part is incomplete; its last line is not $1"
}

# The text of a Content-Security-Policy that lets just this script and this style work.
fingerprint() { # FILE
  hex=$(sha256sum <"$1")
  # printf understands octal numbers everywhere.
  octal=$(printf '%s' "${hex%% *}" | awk '{
    digits = "0123456789abcdef"
    for (i = 1; i < length($0); i += 2)
      printf "\\%03o", index(digits, substr($0, i, 1)) * 16 - 17 + index(digits, substr($0, i + 1, 1))
  }')
  # shellcheck disable=SC2059  # the escapes are the point
  printf "'sha256-%s'" "$(printf "$octal" | base64)"
}

start_head() { # NAME TITLE
  script=$(fingerprint "$here/$1.js")
  style=$(fingerprint "$here/report.css")
  cat <<HTML
<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<meta name="viewport" content="width=device-width, initial-scale=1">
<meta http-equiv="Content-Security-Policy" content="default-src 'none'; script-src $script; style-src $style; base-uri 'none'; form-action 'none'">
<meta name="referrer" content="no-referrer">
<meta name="generator" content="vornreport $1">
<title>$2</title>
HTML
  printf '<style>'
  cat "$here/report.css"
  printf '</style>\n'
}

# The data blocks follow in a template element, whose content a browser neither runs nor shows: the
# page reads them as text. So no file's name can become a script, whatever it holds.
start_page() {
  start_head report 'Storage report'
  echo '<template id="data">'
}

language() { # CODE
  printf '<script>\nvar vornLang = '\''%s'\'';\n</script>\n' "$1"
}

# A report without rows leaves an end tag that no start tag precedes. The parser drops it, so the
# page is told their number: it tells "no rows" from "no data".
count_empty_blocks() { # FILE
  awk '/^<script/ { open = 1 }
       /<\/script>$/ { if (!open) empty++; open = 0 }
       END { print empty + 0 }' <"$1"
}

end_head() { # FILE
  empty=$(count_empty_blocks "$1")
  # A report that failed half-way leaves its block open, and the rest of the page inside it.
  case $(tail -n 1 -- "$1") in
    *'</script>' | '<template id="data">') ;;
    *) printf '\n</script>\n' ;;
  esac
  printf '</template>\n</head>\n<body data-empty="%s">\n' "$empty"
}

time_zone() {
  zone=$(readlink /etc/localtime || true)
  case $zone in
    */zoneinfo/*) zone=${zone##*/zoneinfo/} ;;
    *) zone=$(head -n 1 /etc/timezone 2>/dev/null || true) ;;
  esac
  case $zone in
    '' | *[!A-Za-z0-9/_+-]*) date '+%z' | sed 's/..$/:&/' ;;  # its distance from UTC, then
    *) printf '%s' "$zone" ;;
  esac
}

start_body() {
  host=$(uname -n | tr -cd 'A-Za-z0-9.-')
  profile=$(printf '%s' "${VORN_PROFILE-}" | tr -cd 'A-Za-z0-9._-')
  now=$(date '+%s')
  printf '<a class="skip" href="#report">Skip to the report</a>\n<header>\n'
  printf '<h1>Storage report %s</h1>\n<p>%s %s</p>\n' "$host" "$profile" \
    "$(date -d "@$now" '+%Y-%m-%d %H:%M %Z')"
  printf '<noscript><p>This page needs JavaScript to show the reports. '
  printf 'Their rows stand in the CSV files that are linked below.</p></noscript>\n</header>\n'
  printf '<main id="report" data-host="%s" data-profile="%s" data-time="%s" data-zone="%s">\n' \
    "$host" "$profile" "$now" "$(time_zone)"
}

section() { # REPORT
  printf '<section data-report="%s">\n<h2>%s</h2>\n' "$1" "$(printf '%s' "$1" | tr _ ' ')"
  case $1 in
    quota_usage | file_group) ;;  # whose rows are in no CSV file
    *) printf '<p><a href="csv/%s.csv">CSV file</a></p>\n' "$1" ;;
  esac
  echo '</section>'
}

# All dictionaries, so that a reader can switch; a file that isn't named by a language's code, such
# as a copy, is none. No text of theirs can end the element.
dictionaries() {
  for file in "$here"/lang/*.json; do
    code=${file##*/}
    code=${code%.json}
    case $code in
      '' | -* | *[!A-Za-z0-9-]* | ????????*) continue ;;
    esac
    printf '<script type="application/json" data-language="%s">' "$code"
    sed 's/</\\u003c/g' "$file"
    printf '</script>\n'
  done
}

finish_page() { # NAME
  printf '</main>\n'
  dictionaries
  printf '<script>'
  cat "$here/$1.js"
  printf '</script>\n</body>\n</html>\n'
}

# The list of all reports around its data, one line of JSON without any '<'. Whoever puts it in the
# place of an older one knows that by its generator.
index_page() {
  start_head index 'Storage reports'
  printf '</head>\n<body>\n<header>\n'
  printf '<h1>Storage reports</h1>\n<noscript><p>This page needs JavaScript to list the reports. '
  printf 'Each is a folder beside it; <a href="latest/report.html">the newest</a>.</p></noscript>\n'
  printf '</header>\n<main id="report">\n<script type="application/json" id="data">'
  cat
  printf '</script>\n'
  finish_page index
}

if [ "$*" = index ]; then
  index_page
  exit
fi
[ $# -ge 2 ] || usage "a sub-command and a file are needed"
command=$1 file=$2 word=${3-}
[ $# -le 3 ] || usage "too many arguments"
case $command$# in
  header[23] | lang3 | body[23] | tail2) ;;
  *) usage "not a sub-command with $# arguments: $command" ;;
esac
case $word in
  '') [ $# -eq 2 ] || usage "an empty name" ;;
  *[!A-Za-z0-9_-]*) usage "not a name: $word" ;;
esac
[ ! -L "$file" ] || fail "$file is a symbolic link; it is not written to"

case $command$# in
  header2)
    text=$(start_page)
    : >"$file"
    add_to_page "$file" "$text"
    ;;
  lang3)
    text=$(language "$word")
    [ -f "$file" ] || fail "$file is missing; start it with: header $file"
    [ "$(tail -n 1 -- "$file")" = '<template id="data">' ] ||
      spoil "$file" "its beginning is not whole"
    add_to_page "$file" "$text"
    ;;
  header3)
    [ -f "$file" ] || fail "$file is missing; start it with: header $file"
    text=$(end_head "$file")
    add_to_page "$file" "$text"
    ;;
  body2)
    start_body >"$file"
    ;;
  body3)
    require_part "$file" '</section>' '<main'
    section "$word" >>"$file"
    ;;
  tail2)
    require_part "$file" '</section>' '<main'
    finish_page report >>"$file"
    ;;
esac
