# The vendor's properties are loaded from partitions in super, or else from their backups
. /share/story.sh
. /share/properties.sh

backup=/cache/recovery/oem.prop
long_value=$(printf %092d 0)

# As if the device had been started from that slot.
start_from_slot() {
  rm -f /dev/__properties__/ro.boot.slot_suffix
  setprop ro.boot.slot_suffix "$1"
}

make_super_of_two_slots() {
  property_image oem_a 2M "oem.slot=a" "a line without its sign" "oem.long=$long_value" \
    "sys.powerctl=reboot" "oem.last=read" &&
    property_image kcf_a 2M "kcf.slot=a" && property_image oem_b 2M "oem.slot=b" &&
    property_image kcf_b 2M &&
    make_super /dev/block/by-name/super oem_a=3M:/tmp/oem_a.img kcf_a=3M:/tmp/kcf_a.img \
      oem_b=3M:/tmp/oem_b.img kcf_b=3M:/tmp/kcf_b.img
}

add_volume oem /oem wait,logical
add_volume kcf /kcf wait,logical
add_volume /dev/block/by-name/userdata /data wait
format_cache
step "Super gets its partitions" make_super_of_two_slots
expect_status 0
start_from_slot _a

setprop ctl.stop property_loader
step "A loader that does not answer holds up nothing but its time" sentrova properties load
expect_status 1
expect_seconds 10 20
expect_output_contains "Success to mount /oem at /dev/block/dm-"
expect_output_contains "load property end"
expect_nothing_left
setprop ctl.start property_loader
check "the loader is back" wait_for 5 loader_is_idle

step "The properties are loaded from slot a" sentrova properties load
expect_status 0
expect_seconds 0 5
expect_output_contains "oem properties: ready; kcf properties: ready"
expect_properties oem.slot a kcf.slot a oem.last read oem.long "" sys.powerctl ""
check "a line without its sign is told" grep -q 'oem.prop:2: skipped' $loader_log
check "a value of 92 bytes is told" grep -q 'oem.long has 92 bytes' $loader_log
expect_equal "the backup" "$(cat /tmp/oem.prop)" "$(cat $backup)"
expect_equal "the backup's mode" 644 "$(stat -c %a $backup)"
expect_nothing_left

setprop recovery.repair_mode 1
step "In repair mode the partitions stay" sentrova properties load
expect_status 0
check "the properties can be read" grep -q oem.slot=a /oem/oem.prop
expect_equal "the mappings" "kcf_a oem_a" "$(mappings | sort | xargs)"
setprop recovery.repair_mode 0
step "After it they go" sentrova properties load
expect_status 0
expect_output_contains "Success to unmount /oem "
expect_nothing_left

start_from_slot _b
setprop ro.recovery.kcf.support 1
step "Slot b lacks the kcf properties that the device needs" sentrova properties load
expect_status 0
expect_output_contains "oem properties: ready; kcf properties: ready"
expect_properties oem.slot a kcf.slot a
check "the backups stay" grep -q oem.slot=a $backup
expect_nothing_left

printf x | dd of=/dev/block/by-name/super bs=1 seek=8191 conv=notrunc 2>/dev/null
setprop oem.slot none
step "The table of slot b is damaged" sentrova properties load
expect_status 0
expect_output_contains "for slot 1 is not usable: its checksum is wrong"
expect_output_contains "Fail to mount /oem at oem ("
expect_properties oem.slot a
expect_nothing_left
start_from_slot _c
step "A slot that super does not know" sentrova properties load
expect_status 0
expect_output_contains "/dev/block/by-name/super has no logical partition oem_c"
expect_properties oem.slot a
expect_nothing_left

rm -r /cache/recovery
: >/cache/recovery
step "Neither partitions nor backups" sentrova properties load
expect_status 1
expect_seconds 0 8
expect_output_contains "oem properties: not ready; kcf properties: not ready"
check "the loader tells why" grep -q "cannot read $backup: Not a directory" $loader_log
expect_nothing_left
rm /cache/recovery

start_from_slot _a
step "Slot a is as it was" sentrova properties load
expect_status 0
check "there is a backup" [ -s $backup ]
step "The backups are given up" sentrova properties clear
expect_status 0
check "there is none" [ ! -e $backup ]

step "No persistent properties without data" sentrova properties persist
expect_status 1
mkdir -p /tmp/data/property
echo "persist.sys.language=en" >/tmp/data/property/persistent_properties
/system/bin/mke2fs -q -F -t ext4 -d /tmp/data /dev/block/by-name/userdata
step "The persistent properties are loaded from data" sentrova properties persist
expect_status 0
expect_properties persist.sys.language en
finish
