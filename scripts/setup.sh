#!/usr/bin/env bash
# Installs the Debian packages the build and the tests need, when missing.
# Usage: scripts/setup.sh [native|windows|wine|wine32|bench]...
#
# wine32 is Debian's 32-bit Wine (wine32:i386) beside wine64, which runs the
# x86 DLLs. It needs the i386 architecture and more care than a plain
# install (see install_wine32); when it cannot be installed the script says
# why and exits with 3, after installing everything else it was asked for.
set -euo pipefail

want=(cmake make g++ googletest libgtest-dev libgmock-dev libbenchmark-dev nlohmann-json3-dev)
with_wine32=0
for part in "$@"; do
  case "$part" in
    native) ;;
    windows) want+=(g++-mingw-w64-x86-64 g++-mingw-w64-i686 mingw-w64-tools libwine-dev) ;;
    wine) want+=(wine64 xvfb xauth) ;;
    wine32) want+=(wine64); with_wine32=1 ;;
    bench) want+=(python3) ;;
    *) echo "setup: unknown part '$part'" >&2; exit 2 ;;
  esac
done

sudo=""
[ "$(id -u)" -ne 0 ] && sudo="sudo"
export DEBIAN_FRONTEND=noninteractive
# Another install on the machine holds dpkg's lock for a while: wait for it.
apt_get() { $sudo apt-get -o DPkg::Lock::Timeout=600 "$@"; }

installed() {
  dpkg-query -W -f='${Status}' "$1" 2>/dev/null | grep -q "install ok installed"
}

missing=()
for pkg in "${want[@]}"; do
  installed "$pkg" || missing+=("$pkg")
done
if [ ${#missing[@]} -gt 0 ]; then
  echo "setup: installing ${missing[*]}"
  apt_get update -qq
  apt_get install -y -qq "${missing[@]}"
fi

# In a deb822 sources file, gives every entry without an Architectures field
# one: the security suites the native architecture only, the others i386 too.
restrict_deb822() {
  local native=$1
  awk -v native="$native" '
    function flush() {
      if (n == 0) return
      for (i = 1; i <= n; i++) print lines[i]
      if (!has_arch && is_deb) print "Architectures: " native (security ? "" : " i386")
      n = 0; has_arch = 0; security = 0; is_deb = 0
    }
    /^[ \t]*$/ { flush(); print; next }
    {
      lines[++n] = $0
      if (tolower($0) ~ /^architectures:/) has_arch = 1
      if (tolower($0) ~ /^suites:/ && $0 ~ /-security/) security = 1
      if (tolower($0) ~ /^types:/ && $0 ~ /(^|[ \t])deb([ \t]|$)/) is_deb = 1
    }
    END { flush() }'
}

# The same for one-line sources ("deb [options] uri suite components").
restrict_one_line() {
  local native=$1
  awk -v native="$native" '
    /^[ \t]*deb[ \t]/ && $0 !~ /arch=/ {
      archs = native ($0 ~ /-security/ ? "" : ",i386")
      if ($0 ~ /^[ \t]*deb[ \t]+\[/) sub(/\[/, "[arch=" archs " ")
      else sub(/deb[ \t]+/, "deb [arch=" archs "] ")
    }
    { print }'
}

rewrite_sources() {
  local native=$1 file tmp
  for file in /etc/apt/sources.list /etc/apt/sources.list.d/*.list /etc/apt/sources.list.d/*.sources; do
    [ -f "$file" ] || continue
    tmp=$(mktemp)
    case "$file" in
      *.sources) restrict_deb822 "$native" <"$file" >"$tmp" ;;
      *) restrict_one_line "$native" <"$file" >"$tmp" ;;
    esac
    if cmp -s "$file" "$tmp"; then
      rm -f "$tmp"
    else
      echo "setup: $file: architectures of each source written out"
      $sudo cp "$tmp" "$file"
      rm -f "$tmp"
    fi
  done
}

# The highest of the versions apt offers for a package (given with its
# architecture), or nothing.
best_version() {
  local best="" v
  for v in $(apt-cache madison "$1" 2>/dev/null | awk -F'|' '{gsub(/ /, "", $2); print $2}'); do
    if [ -z "$best" ] || dpkg --compare-versions "$v" gt "$best"; then best=$v; fi
  done
  echo "$best"
}

# A library both architectures share (Multi-Arch: same) must have one
# version on both. Some amd64 libraries here come from bookworm-security,
# whose i386 index is not used: for each of wine32's dependencies whose
# installed amd64 version is newer than every i386 one, both are pinned to
# the best i386 version (a downgrade of the amd64 one).
shared_library_pins() {
  local native=$1 pkg name have ma best
  apt-cache depends --recurse --no-recommends --no-suggests --no-conflicts \
      --no-breaks --no-replaces --no-enhances wine32:i386 2>/dev/null |
    grep -E '^[a-z0-9][^ ]*:i386$' | sort -u |
    while read -r pkg; do
      name=${pkg%:i386}
      have=$(dpkg-query -W -f='${Status}|${Version}|${Multi-Arch}' "$name:$native" 2>/dev/null) || continue
      case "$have" in "install ok installed|"*"|same") ;; *) continue ;; esac
      have=${have#*|}; have=${have%|*}
      best=$(best_version "$name:i386")
      [ -n "$best" ] || continue
      if dpkg --compare-versions "$have" gt "$best"; then
        echo "$name:$native=$best $name:i386=$best"
      fi
    done
}

install_wine32() {
  local native codename pins
  native=$(dpkg --print-architecture)
  codename=$(. /etc/os-release && echo "${VERSION_CODENAME:-}")
  if [ "$native" != amd64 ]; then
    echo "setup: 32-bit Wine needs an amd64 machine, this one is $native"
    return 1
  fi
  if [ -z "$codename" ]; then
    echo "setup: no release codename in /etc/os-release"
    return 1
  fi
  if [ -n "$sudo" ] && ! command -v sudo >/dev/null; then
    echo "setup: not root and no sudo: cannot install 32-bit Wine"
    return 1
  fi
  echo "setup: installing 32-bit Wine (wine32:i386)"
  dpkg --print-foreign-architectures | grep -qx i386 || $sudo dpkg --add-architecture i386
  rewrite_sources "$native"
  apt_get update -qq || return 1
  pins=$(shared_library_pins "$native" | tr '\n' ' ')
  [ -z "$pins" ] || echo "setup: pinned to the i386 versions: $pins"
  # shellcheck disable=SC2086 # the pins are separate words
  apt_get install -y -qq --allow-downgrades -t "$codename" --no-install-recommends wine32:i386 $pins || return 1
  [ -x /usr/lib/wine/wine ]
}

if [ "$with_wine32" -eq 1 ] && ! installed wine32:i386; then
  if ! install_wine32; then
    echo "setup: 32-bit Wine (wine32:i386) could not be installed"
    exit 3
  fi
fi
exit 0
