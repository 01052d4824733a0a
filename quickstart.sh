#!/bin/bash
# Builds the product and makes a first report of some folders, without installing anything but the
# packages it is built with: quickstart.sh [FOLDER...]   (default: your home folder)
#
# The last line it prints is the path of the report page.
set -euo pipefail
export LC_ALL=C.UTF-8

root=$(realpath -- "$(dirname -- "$0")")
build=$root/build/quickstart
stage=$root/build/quickstart-stage
report_dir=$root/quickstart-report
profile=quickstart
log_dir=''

fail() {
  echo "quickstart.sh: $*" >&2
  exit 1
}

# What the product would refuse or change in a path that a configuration file gives it.
check_path() { # PATH WHAT
  case $1 in
    *\'* | *[[:cntrl:]]*) fail "$2 has a single quote or a control character in its path: $1" ;;
    *' ') fail "$2 has a blank at the end of its path: $1" ;;
  esac
}

folders=()
find_folders() { # FOLDER...
  local folder
  if [[ $# -eq 0 ]]; then
    set -- "$(getent passwd "${SUDO_USER:-$(id -un)}" | cut -d: -f6)"
  fi
  for folder; do
    [[ -n $folder && -e $folder ]] || fail "no such folder: $folder"
    [[ -d $folder ]] || fail "not a folder: $folder"
    folder=$(realpath -- "$folder")
    case $folder/ in
      /dev/* | /proc/* | /sys/* | /usr/vorn/* | /etc/cron.d/*)
        fail "$folder holds nobody's files; name another folder" ;;
    esac
    check_path "$folder" "the folder"
    folders+=("$folder")
  done
}

# A share name from a folder's name: what a name can't hold becomes "_", a number gets a word
# before it, and a name that is taken a number after it.
declare -A taken=()
share_name() { # FOLDER; sets $name
  name=${1##*/}
  name=$(printf '%s' "${name:-root}" | iconv -c -f UTF-8 -t UTF-8 | tr -s ' ')
  name=${name//[[:cntrl:]\"\'\`\\<>,\[\]#;=]/_}
  while [[ $(printf '%s' "$name" | wc -c) -gt 56 ]]; do
    name=${name%?}
  done
  name=${name# } name=${name% }
  if [[ -z $name || $name =~ ^[-+.0-9eE]+$ || $name == [-+=@]* ]]; then
    name=share$name
  fi
  local base=$name number=1
  while [[ -n ${taken[$name]-} ]]; do
    number=$((number + 1))
    name="$base-$number"
  done
  taken[$name]=1
}

write_configuration() {
  local folder
  : >"$stage/usr/vorn/etc/share.conf"
  for folder in "${folders[@]}"; do
    share_name "$folder"
    printf '[%s]\npath = %s\n' "$name" "$folder" >>"$stage/usr/vorn/etc/share.conf"
  done
  in_sandbox -- /usr/vorn/bin/vornctl profile add "$profile"
}

# The product in its place; the machine's own /tmp, so that a folder in it can be reported on.
in_sandbox() { # [SANDBOX-OPTION...] -- COMMAND...
  "$root/tools/sandbox.sh" --stage "$stage" --tmp /tmp "$@"
}

# The user who called sudo gets what was made for them.
give_back() {
  if [[ $EUID -eq 0 && -n ${SUDO_UID-} ]]; then
    chown -Rh "$SUDO_UID:${SUDO_GID:-$SUDO_UID}" "$root/build" 2>/dev/null || true
  fi
  if [[ -n $log_dir ]]; then
    rm -rf "$log_dir"
  fi
}

# As the user who called sudo: root writes nothing where a user decides what stands in the way.
as_user() {
  if [[ $EUID -eq 0 && -n ${SUDO_UID-} ]]; then
    setpriv --reuid "$SUDO_UID" --regid "${SUDO_GID:-$SUDO_UID}" --clear-groups -- "$@"
  else
    "$@"
  fi
}

# The product writes reports only where nobody but root does, so the report was made in the stage.
hand_over() { # REPORT-FOLDER
  as_user mkdir -p "$report_dir/$profile"
  tar -C "${1%/*}" --owner 0 --group 0 -cf - "${1##*/}" |
    as_user tar -C "$report_dir/$profile" --no-same-owner -xf -
}

# A system log of its own for the run: whatever comes in at the socket goes to a file.
start_log() {
  log_dir=$(mktemp -d /tmp/vornreport-log.XXXXXX)
  perl -MSocket -e '
    socket(LOG, AF_UNIX, SOCK_DGRAM, 0) && bind(LOG, sockaddr_un($ARGV[0])) or die "no log: $!\n";
    while (defined(recv(LOG, $_, 65536, 0)) && $_ ne "stop") {
      s/^<\d+>.{16}//; s/\s*$/\n/; print;
    }' "$log_dir/socket" | tr -d '\000-\010\013-\037\177' >"$log_dir/lines" &
  log_pid=$!
  while [[ ! -S $log_dir/socket ]] && kill -0 "$log_pid" 2>/dev/null; do
    sleep 0.02
  done
}

stop_log() {
  perl -MSocket -e '
    socket(LOG, AF_UNIX, SOCK_DGRAM, 0);
    send(LOG, "stop", 0, sockaddr_un($ARGV[0]));' "$log_dir/socket"
  wait "$log_pid"
}

show_rows() { # CSV-FILE COLUMN-OF-NAME COUNT
  # Names may hold anything; a terminal gets no control characters from them.
  # (Nothing here may stop reading early: the broken pipe would end this script.)
  sed -n "2,$(($3 + 1))p" "$1" | tr -d '\000-\010\013-\037\177' | sed 's/^"//; s/"$//; s/""/"/g' |
    awk -F '"\t"' -v column="$2" '{ print $NF "\t" $column }' |
    numfmt --delimiter=$'\t' --to=iec-i --suffix=B | awk -F '\t' '{ printf "  %10s  %s\n", $1, $2 }'
}

check_path "$report_dir" "the report folder"
find_folders "$@"
# shellcheck source=tools/packages.sh
. "$root/tools/packages.sh"
trap give_back EXIT

echo "== Packages"
install_missing "${build_packages[@]}"

echo "== Build"
cmake -S "$root" -B "$build" -G Ninja -DCMAKE_BUILD_TYPE=Release -DBUILD_TESTING=OFF >/dev/null
cmake --build "$build" --parallel "$(nproc)"

echo "== Report"
rm -rf "$stage"
mkdir -p "$stage"
DESTDIR=$stage cmake --install "$build" >/dev/null
write_configuration
start_log
in_sandbox --log "$log_dir/socket" -- /usr/vorn/bin/vornreport --report "$profile" \
  >"$stage/output" 2>&1 || true
stop_log
cat "$log_dir/lines" >&2

made=''
if [[ $(head -n 1 "$stage/usr/vorn/var/status/$profile" 2>/dev/null) == success ]]; then
  made=$(find "$stage/usr/vorn/var/reports/$profile" -mindepth 2 -maxdepth 2 -name report.html)
fi
[[ -n $made ]] || fail "the report failed; its log stands above, all its output in $stage/output"
hand_over "${made%/*}"
page=$report_dir/$profile/$(basename "${made%/*}")/report.html

if [[ $(wc -l <"${page%/*}/csv/share_list.csv") -lt 2 ]]; then
  echo "There are no files in these folders." >&2
fi
echo "Shares:"
show_rows "${page%/*}/csv/share_list.csv" 1 20
echo "Largest files:"
show_rows "${page%/*}/csv/large_file.csv" 2 5
echo "The report page:"
echo "$page"
