# An update package is read off its partition by its block map, while nothing is mounted
. /share/story.sh

volume=/dev/block/by-name/logdata
folder=/tmp/volume

prepare_volume() {
  mkdir -p "$folder" && /system/bin/mke2fs -q -F -t ext4 -b 4096 "$volume" && mount -t ext4 "$volume" "$folder" &&
    head -c 5000000 /dev/urandom >"$folder/package" &&
    head -c 100 "$folder/package" >"$folder/with_hole" && truncate -s 100000 "$folder/with_hole"
}

damage_map() { sed '4s/ .*/ 99999999999/' /tmp/package.map >/tmp/damaged.map; }

step "A package is put on a partition" prepare_volume
expect_status 0
step "What are its size and digest?" sha256sum "$folder/package"
digest=${output%% *}

step "Its block map is written" sentrova blockmap "$folder/package" -o /tmp/package.map
expect_status 0
expect_output_contains " ranges on /dev/block/"
step "A map that exists is not overwritten" sentrova blockmap "$folder/package" -o /tmp/package.map
expect_status 4
expect_output_contains "cannot make /tmp/package.map: File exists"
step "A file with a hole has no map" sentrova blockmap "$folder/with_hole"
expect_status 2
expect_output_contains "cannot be mapped: it has a hole at byte 4096"
step "Nor has one in memory" sentrova blockmap /tmp/package.map
expect_status 2
expect_output_contains "cannot be mapped: its file system is not on a block device"

step "The partition is unmounted" umount "$folder"
expect_status 0
step "The package is read through the map" sentrova blockmap --check /tmp/package.map
expect_status 0
expect_output_contains "5000000 bytes in "
expect_output_contains "sha256 $digest"
step "And told to a program" sentrova --json blockmap --check /tmp/package.map
expect_output_contains '"file_size":5000000,'
expect_output_contains "\"sha256\":\"$digest\""

step "A range of the map gets damaged" damage_map
step "The damaged map is refused" sentrova blockmap --check /tmp/damaged.map
expect_status 2
expect_output_contains "Invalid range: "
finish
