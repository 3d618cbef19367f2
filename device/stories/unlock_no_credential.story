# An owner without a password: the device-encrypted storage opens, and the rest with it
# disk: fbe_metadata_open
. /share/story.sh
. /share/host.sh
. /share/owner_data.sh

step "What is there?" sentrova status
expect_output_contains "credential: none is set"
expect_output_contains "/data: nothing is mounted"
expect_disk_hides_photograph

unlock "Unlocking"
expect_status 0
expect_output_contains "credential: none is set"
expect_output_contains "readable now: everything"
expect_photograph_whole
expect_equal "the result property" success "$(result_property)"
expect_file_has /share/rescue_host.log "password isn't enable. Decrypt the CE data of user 0 directly"
finish
