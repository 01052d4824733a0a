#!/bin/bash
# Runs a command in a private view of this machine, where a staged product is installed in its
# place: the product's paths are constants, and this is how it runs without touching the host.
#
# Private are /usr/vorn (the stage's), /tmp, /dev and /etc/cron.d. All the rest, the network
# included, is the host's, writable where it is writable on the host. Root needs no user namespace
# for this, so ownership and permissions work as usual; another user gets one.
set -euo pipefail

usage() {
  cat >&2 <<'USAGE'
usage: tools/sandbox.sh --stage DIR [OPTION]... -- COMMAND [ARGUMENT]...
  --stage DIR         DIR/usr/vorn appears as /usr/vorn (made when missing)
  --tmp DIR           DIR appears as /tmp (default: an empty one in memory)
  --tmp-size BYTES    /tmp is in memory and holds no more than BYTES
  --log SOCKET        SOCKET appears as /dev/log (default: there is none)
  --cron DIR          DIR appears as /etc/cron.d (default: an empty one)
  --bind SRC DST      SRC appears as DST; can be repeated
  --tmpfs BYTES DST   an empty folder in memory of no more than BYTES; can be repeated
USAGE
  exit 2
}

fail() {
  echo "sandbox.sh: $*" >&2
  exit 1
}

# A folder that has to get an entry it doesn't have: made anew from the host's entries, so that
# the entry's mount point never appears on the host.
rebuild() { # FOLDER ENTRY-TO-LEAVE-OUT
  local entry
  args+=(--tmpfs "$1")
  for entry in "$1"/*; do
    if [[ $entry == "$1/$2" ]]; then
      continue
    elif [[ -L $entry ]]; then
      args+=(--symlink "$(readlink "$entry")" "$entry")
    else
      args+=(--dev-bind "$entry" "$entry")
    fi
  done
}

# Outside the private folders a missing mount point would be made on the host itself.
check_target() { # DST
  case $1 in
    /tmp/* | /dev/* | /usr/vorn/*) ;;
    /*) [[ -e $1 ]] || fail "$1 does not exist; make it first" ;;
    *) fail "$1 is not absolute" ;;
  esac
}

stage='' tmp='' tmp_size='' log='' cron='' extra=()
while [[ $# -gt 0 ]]; do
  case $1 in
    --stage | --tmp | --tmp-size | --log | --cron) [[ $# -ge 2 && -n $2 ]] || usage ;;&
    --stage) stage=$2 && shift 2 ;;
    --tmp) tmp=$2 && shift 2 ;;
    --tmp-size) tmp_size=$2 && shift 2 ;;
    --log) log=$2 && shift 2 ;;
    --cron) cron=$2 && shift 2 ;;
    --bind | --tmpfs)
      [[ $# -ge 3 ]] || usage
      check_target "$3"
      if [[ $1 == --bind ]]; then
        extra+=(--bind "$2" "$3")
      else
        extra+=(--size "$2" --tmpfs "$3")
      fi
      shift 3
      ;;
    --) shift && break ;;
    *) usage ;;
  esac
done
[[ -n $stage && $# -gt 0 ]] || usage
[[ -z $tmp || -z $tmp_size ]] || usage
command -v bwrap >/dev/null || fail "bwrap is missing; install the package bubblewrap"

mkdir -p "$stage/usr/vorn"
shopt -s dotglob nullglob

args=(--die-with-parent --dev-bind / / --dev /dev)
rebuild /usr vorn
args+=(--bind "$stage/usr/vorn" /usr/vorn)
if [[ ! -d /etc/cron.d ]]; then
  rebuild /etc cron.d
fi
if [[ -n $cron ]]; then
  args+=(--bind "$cron" /etc/cron.d)
else
  args+=(--tmpfs /etc/cron.d)
fi
if [[ -n $tmp ]]; then
  args+=(--bind "$tmp" /tmp)
elif [[ -n $tmp_size ]]; then
  args+=(--perms 1777 --size "$tmp_size" --tmpfs /tmp)
else
  args+=(--perms 1777 --tmpfs /tmp)
fi
if [[ -n $log ]]; then
  args+=(--bind "$log" /dev/log)
fi

exec bwrap "${args[@]}" "${extra[@]}" -- "$@"
