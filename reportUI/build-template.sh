#!/bin/sh
# Builds the frame of the report page around the data blocks that the reports append.
#
# The page stands alone: style, dictionary and script are put into it. A page is complete when it
# begins with <!DOCTYPE html> and ends with </html>. So that a page that lost a part in between, on a
# disk that was full for a moment, never is: a sub-command that can't write its part of the page
# empties the page, and `tail` ends only a body file whose parts are all there.
set -eu

here=${0%/*}/template

usage() {
  echo "build-template.sh: $1" >&2
  cat >&2 <<'USAGE'
usage: build-template.sh header FILE          starts the page in FILE
       build-template.sh lang FILE CODE       adds the dictionary of language CODE
       build-template.sh header FILE REPORT   ends the head, after the data blocks
       build-template.sh body FILE            starts the body in FILE
       build-template.sh body FILE REPORT     adds the section of REPORT
       build-template.sh tail FILE            ends the body and the page
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
    [ "$last" != "$line" ] || return 0
  done
  fail "$part is incomplete; its last line is not $1"
}

start_page() {
  cat <<'HTML'
<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<meta name="viewport" content="width=device-width, initial-scale=1">
<meta http-equiv="Content-Security-Policy" content="default-src 'none'; style-src 'unsafe-inline'; script-src 'unsafe-inline'; base-uri 'none'; form-action 'none'">
<title>Storage report</title>
<style>
HTML
  cat "$here/report.css"
  echo '</style>'
}

# The most exact dictionary there is: de-AT, else de, else English.
dictionary() { # CODE
  for name in "$1" "${1%%-*}" en; do
    if [ -f "$here/lang/$name.js" ]; then
      cat "$here/lang/$name.js"
      return
    fi
  done
  fail "the dictionary $here/lang/en.js is missing"
}

language() { # CODE
  printf '<script>\nvar vornLang = '\''%s'\'';\n' "$1"
  dictionary "$1"
  printf 'document.documentElement.lang = vornText.lang;\n</script>\n'
}

# A report without rows leaves an end tag that no start tag precedes (file types: after a brace). The
# parser drops it, so the page is told their number: it tells "no rows" from "no data".
count_empty_blocks() { # FILE
  awk '/^<script/ { open = 1 }
       /<\/script>$/ { if (!open) empty++; open = 0 }
       END { print empty + 0 }' <"$1"
}

end_head() { # FILE
  empty=$(count_empty_blocks "$1")
  # A report that failed half-way leaves its block open, and the rest of the page inside it.
  case $(tail -n 1 -- "$1") in
    *'</script>' | '</style>') ;;
    *) printf '\n</script>\n' ;;
  esac
  # A run that found its language setting bad adds none; the page speaks English then.
  if ! grep -q '^var vornLang = ' <"$1"; then
    language en
  fi
  printf '<meta name="vorn-empty-reports" content="%s">\n</head>\n<body>\n' "$empty"
}

start_body() {
  host=$(uname -n | tr -cd 'A-Za-z0-9.-')
  printf '<header>\n<h1 data-text="title">Storage report</h1>\n'
  printf '<p><span id="host">%s</span> · <time>%s</time></p>\n' "$host" "$(date '+%Y-%m-%d %H:%M')"
  printf '</header>\n<main>\n'
}

section() { # REPORT
  printf '<section data-report="%s">\n<h2>%s</h2>\n' "$1" "$(printf '%s' "$1" | tr _ ' ')"
  case $1 in
    quota_usage | file_group) # whose rows are in no CSV file
      echo '<table></table>'
      echo '<noscript><p>This table needs JavaScript.</p></noscript>'
      ;;
    *)
      printf '<p class="csv"><a href="csv/%s.csv" data-text="csv">CSV file</a></p>\n' "$1"
      echo '<table></table>'
      printf '<noscript><p>This table needs JavaScript. Its rows stand in csv/%s.csv.</p></noscript>\n' "$1"
      ;;
  esac
  echo '</section>'
}

finish_page() {
  printf '</main>\n<script>\n'
  cat "$here/report.js"
  printf '</script>\n</body>\n</html>\n'
}

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
    [ "$(tail -n 1 -- "$file")" = '</style>' ] || spoil "$file" "its beginning is not whole"
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
    require_part "$file" '</section>' '<main>'
    section "$word" >>"$file"
    ;;
  tail2)
    require_part "$file" '</section>' '<main>'
    finish_page >>"$file"
    ;;
esac
