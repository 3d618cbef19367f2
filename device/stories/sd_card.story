# An SD card is found, inserted before or after the first look, with and without partitions
# devices: sd
. /share/story.sh
. /share/host.sh

card=/dev/block/mmcblk1
partition=/dev/block/mmcblk1p1

write_fstab
mkdir -p /mnt/sdcard

step "The volumes, with an empty slot" volume_probe volumes
expect_status 0
expect_output_contains "/sdcard  vfat  0"
step "Is there a card?" volume_probe sdcard 0
expect_status 1
expect_output_contains "find sdcard devices (NULL)"

start_probe sdcard 30
check "a program looks for the card again and again" wait_for 20 logged 4 "(NULL)"
check "it still looks" probe_runs
step "A card is inserted meanwhile" ask_host insert_sd
expect_status 0
end_of_probe "The program finds it"
expect_status 0
# Of a card that has just come, the whole disk may be there before its partition.
expect_output_contains "find sdcard devices ($card"
check "the partition comes" wait_for 5 present "$partition"
expect_equal "the card's partition" sd-disk "$(partition_name "$partition")"
step "It takes a file" put_file "$partition" /mnt/sdcard
expect_status 0

step "The card is taken out" ask_host eject_sd
expect_status 0
check "the card goes" wait_for 5 absent "$card"
step "Is there still a card?" volume_probe sdcard 0
expect_status 1
expect_output_contains "find sdcard devices (NULL)"
step "The card is inserted again" ask_host insert_sd
expect_status 0
check "the card comes" wait_for 5 present "$partition"

step "A card that is there from the start" volume_probe sdcard 0
expect_status 0
expect_output_contains "/sdcard  vfat $partition 0"
expect_output_contains "find sdcard devices ($partition)"
step "It is the same card" show_file "$partition" /mnt/sdcard
expect_status 0
expect_output "kept here"

step "The card loses its partition table" dd if=/dev/zero of="$card" bs=1M count=1 conv=fsync
expect_status 0
ask_host eject_sd
check "the card goes" wait_for 5 absent "$card"
ask_host insert_sd
check "the card comes" wait_for 5 present "$card"
step "A card without partitions" volume_probe sdcard 0
expect_status 0
expect_output_contains "find sdcard devices ($card)"
finish
