# What is damaged is told and nothing made worse: mended, it opens
# disk: fbe_metadata_password
. /share/story.sh
. /share/credential.sh
. /share/host.sh
. /share/owner_data.sh

metadata_key=/metadata/vold/metadata_encryption/key
userdata=/dev/block/by-name/userdata

fails_at() {
  unlock "$1" "$password"
  expect_status 4
  expect_output_contains "$2"
  expect_output_contains "readable now: ${3-nothing}"
}

# flip_byte FILE OFFSET
flip_byte() {
  byte=$(dd if="$1" bs=1 skip="$2" count=1 2>/dev/null | hexdump -e '1/1 "%d"')
  printf "\\$(printf %o $((byte ^ 1)))" | dd of="$1" bs=1 seek="$2" conv=notrunc 2>/dev/null
}

mv $metadata_key /metadata/key.kept
fails_at "The metadata key is missing" "the metadata encryption of /data stays locked"
expect_equal "the result property" fail "$(result_property)"
cp /metadata/key.kept $metadata_key
flip_byte $metadata_key 40
fails_at "A bit of the metadata key is wrong" "the metadata encryption of /data stays locked"
mv /metadata/key.kept $metadata_key

dd if=$userdata of=/tmp/head bs=64k count=1 2>/dev/null
dd if=/dev/urandom of=$userdata bs=64k count=1 2>/dev/null
fails_at "The start of the partition is overwritten" "stays locked"
expect_data_not_mounted
dd if=/tmp/head of=$userdata bs=64k conv=notrunc,fsync 2>/dev/null

step "Mended, the metadata opens" operation_call fbe-metadata
expect_status 0
mv /data/unencrypted/key/wrapped_key /data/unencrypted/kept
fails_at "The key of the device-encrypted storage is missing" "device-encrypted storage stays locked"
expect_equal "the result property" fail "$(result_property)"
mv /data/unencrypted/kept /data/unencrypted/key/wrapped_key
step "Mended, the device-encrypted storage opens" operation_call fbe-de
expect_status 0
flip_byte /data/system_de/0/ce_key_0 40
fails_at "A bit of the owner's key is wrong" "credential-encrypted storage stays locked" \
  "device-encrypted storage only"
expect_photograph_locked
flip_byte /data/system_de/0/ce_key_0 40

cp /etc/recovery.fstab /tmp/recovery.fstab
sed -i '/ \/data /d' /etc/recovery.fstab
restart_rescue_host
step "An fstab without user data" operation_call fbe-metadata
expect_status 1
expect_file_has /share/rescue_host.log "Fail to find /data entry in fstab"
cp /tmp/recovery.fstab /etc/recovery.fstab
restart_rescue_host

unlock "All is mended" "$password"
expect_status 0
expect_photograph_whole
finish
