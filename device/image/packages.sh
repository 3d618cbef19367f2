# shellcheck shell=bash
# Unpacking Debian packages of the device's architecture. No foreign program is run and no
# privilege is needed.

# The lines of a list file without comments, joined by the separator $2.
read_list() {
  sed -e 's/[[:space:]]*#.*//' -e '/^$/d' "$1" | paste -sd "$2"
}

# unpack_packages FOLDER PACKAGES [MEMBER...]: unpacks the comma-separated packages and all that
# they depend on into the existing FOLDER, or only their files under MEMBER (as ./lib/modules).
# Says nothing unless it fails.
unpack_packages() {
  local folder=$1 packages=$2 work status=0
  shift 2
  work=$(mktemp -d)
  # This machine's own way to the archive (proxies, clock checks) holds for the device's packages.
  apt-config dump | grep '^Acquire::' >"$work/apt.conf" || true
  python3 "$image_source/apt_sources.py" >"$work/sources" || status=1
  # An archive file instead of a folder: so the files belong to whoever builds.
  [ "$status" -ne 0 ] || mmdebstrap --quiet --variant=extract --architectures=arm64 \
    --aptopt="$work/apt.conf" --include="$packages" --format=tar \
    bookworm "$work/root.tar" - <"$work/sources" >"$work/log" 2>&1 || status=1
  [ "$status" -ne 0 ] || tar -x --no-same-owner --exclude='./dev/*' -f "$work/root.tar" \
    -C "$folder" "$@" || status=1
  [ "$status" -eq 0 ] || cat "$work"/log >&2
  rm -rf "$work"
  return "$status"
}
