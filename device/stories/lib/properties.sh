# Words for stories about the vendor's property files.

loader_log=/share/property_loader.log

# property_image NAME SIZE LINE...: /tmp/NAME.img, a file system that holds the lines as what is
# called PARTITION.prop for a NAME of PARTITION or PARTITION_SLOT; without lines it is empty.
property_image() {
  image=$1
  size=$2
  shift 2
  rm -rf /tmp/files
  mkdir -p /tmp/files
  [ $# -eq 0 ] || printf '%s\n' "$@" >"/tmp/files/${image%%_*}.prop"
  /system/bin/mke2fs -q -F -t ext4 -d /tmp/files "/tmp/$image.img" "$size"
}

# The file system that /cache is on; the volume layer mounts it.
format_cache() { /system/bin/mke2fs -q -F -t ext4 /dev/block/by-name/logdata; }

# add_volume DEVICE MOUNT_POINT OPTIONS: a line of the default fstab.
add_volume() { echo "$1 $2 ext4 ro $3" >>/etc/recovery.fstab; }

# Ends a wait for the loader's start: a request that it finds then is answered, too.
loader_is_idle() {
  service_is property_loader running && [ "$(getprop recovery.load.backup_props)" != 1 ] &&
    [ "$(getprop recovery.backup_props.loaded)" = 1 ]
}

mounted() { grep -q " $1 " /proc/mounts; }
not_mounted() { ! mounted "$1"; }

# The names of all device-mapper devices.
mappings() {
  DM_DISABLE_UDEV=1 /system/bin/dmsetup info -c --noheadings -o name | grep -v '^No devices found'
}

# expect_properties NAME VALUE...
expect_properties() {
  while [ $# -gt 0 ]; do
    expect_equal "$1" "$2" "$(getprop "$1")"
    shift 2
  done
}

expect_nothing_left() {
  check "/oem and /kcf are not mounted" not_mounted '/\(oem\|kcf\)'
  expect_equal "the device-mapper devices that are left" "" "$(mappings)"
}

# expect_seconds LEAST MOST: how long the last step took.
expect_seconds() {
  check "it took $taken hundredths of a second, not $1 to $2 s" \
    [ "$taken" -ge $(($1 * 100)) -a "$taken" -lt $(($2 * 100)) ]
}
