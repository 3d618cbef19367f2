# Encrypted files on a file system that is not: it is mounted from the start, and tells nothing
# disk: fbe_password
. /share/story.sh
. /share/credential.sh
. /share/host.sh
. /share/owner_data.sh

step "What is there?" sentrova status
expect_output_contains "encryption type: file"
expect_output_contains "encryption state: encrypted"
expect_output_contains "/data: ext4 on /dev/block/by-name/userdata"
expect_disk_hides_photograph
expect_photograph_locked

unlock "A wrong password" "$wrong_password"
expect_status 1
expect_photograph_locked
check "the device-encrypted storage is open" [ -s /data/user_de/0/alarms.txt ]

unlock "The right password" "$password"
expect_status 0
expect_output_contains "readable now: everything"
expect_photograph_whole
expect_file_has /share/rescue_host.log "metadata encryption is define, Skip decrypt metadata"
expect_equal "the result property" success "$(result_property)"
finish
