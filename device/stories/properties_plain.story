# The vendor's properties are loaded from partitions of the disk, one of them below /vendor
. /share/story.sh
. /share/properties.sh

make_partitions() {
  property_image oem 4M "oem.from=partition" && property_image kcf 4M "kcf.from=partition" &&
    dd if=/tmp/oem.img of=/dev/block/by-name/oem bs=1M 2>/dev/null &&
    dd if=/tmp/kcf.img of=/dev/block/by-name/kcf bs=1M 2>/dev/null
}

mkdir -p /vendor/kcf
add_volume /dev/block/by-name/oem /oem wait
add_volume /dev/block/by-name/kcf /vendor/kcf wait
format_cache
step "The partitions get their files" make_partitions
expect_status 0

step "The properties are loaded" sentrova properties load
expect_status 0
expect_output_contains "oem partition block device is ready:1"
expect_properties oem.from partition kcf.from partition
check "/oem is unmounted" not_mounted /oem
check "what is below /vendor stays" mounted /vendor/kcf
check "there is a backup" grep -q kcf.from=partition /cache/recovery/kcf.prop

umount /vendor/kcf
dd if=/dev/zero of=/dev/block/by-name/oem bs=1M count=1 2>/dev/null
rm /dev/block/by-name/kcf
setprop oem.from none
step "One partition is damaged, one does not come" sentrova properties load
expect_status 0
expect_seconds 4 12
expect_output_contains "Fail to mount /oem at /dev/block/by-name/oem (Invalid argument)"
expect_output_contains "kcf partition block device is ready:0"
expect_properties oem.from partition
finish
