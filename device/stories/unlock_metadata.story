# Encrypted data, from a cold start to the bytes of the owner's photograph
# disk: fbe_metadata_password
. /share/story.sh
. /share/credential.sh
. /share/host.sh
. /share/owner_data.sh
. /share/traces.sh

step "What is there?" sentrova status
note_moment "first answered call"
expect_status 0
expect_output_contains "credential: one is set (type 2)"
expect_output_contains "encryption type: file"
expect_output_contains "encryption state: encrypted"
expect_output_contains "/data: nothing is mounted"
expect_data_not_mounted
expect_disk_hides_photograph

unlock "A wrong password" "$wrong_password"
expect_status 1
expect_output_contains "password: wrong"
expect_photograph_locked

unlock "The right password" "$password"
expect_status 0
expect_output_contains "readable now: everything"
expect_photograph_whole
note_moment "data readable"
expect_equal "the result property" success "$(result_property)"
step "The volumes, which leaves /data open" sentrova volumes
expect_output_contains "/dev/block/by-name/userdata$(printf '\t')/dev/block/dm-0"
expect_photograph_whole

expect_library_time_below_milliseconds 50
expect_no_trace_of_password
finish
