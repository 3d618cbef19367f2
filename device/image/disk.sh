# shellcheck shell=bash
# The component `disk`: the empty internal disk, a sparse file with the device's partitions. Every
# start writes to a throw-away layer over it.

disk_inputs=(partitions.txt disk.sh)

build_disk() {
  local out=$1 name size number=0 args=()
  while read -r name size; do
    number=$((number + 1))
    args+=(-n "$number:0:$size" -c "$number:$name")
  done < <(sed -e 's/#.*//' -e '/^[[:space:]]*$/d' "$image_source/partitions.txt")
  truncate -s 1280M "$out/disk.img"
  sgdisk -o -a 2048 "${args[@]}" "$out/disk.img" >/dev/null
}
