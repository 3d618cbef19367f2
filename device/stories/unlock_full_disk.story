# A whole partition is unlocked by the volume daemon, after it failed, crashed and hung
# disk: fde
. /share/story.sh
. /share/host.sh
. /share/owner_data.sh

# fail_daemon HOW: what comes of a daemon that does nothing but fail in this way.
fail_daemon() {
  setprop debug.vold.behaviour "$1"
  step "The daemon's failure: $1" operation_call fde
  check "no device is mapped" fails [ -e /dev/block/mapper/userdata ]
  check "no daemon is left" fails pidof zuno_vold
}

step "What is there?" sentrova status
expect_output_contains "encryption type: block"
expect_output_contains "encryption state: encrypted"
expect_data_not_mounted
expect_disk_hides_photograph

fail_daemon exit1
expect_output "the service answers 0"
expect_equal "the result property" success "$(result_property)"
fail_daemon abort
expect_output "the service answers -1"
expect_equal "the result property" fail "$(result_property)"
begin_hang=$(now)
fail_daemon hang
expect_output "the service answers -1"
check "it was ended after some ten seconds" [ $(($(now) - begin_hang)) -lt 1300 ]

setprop debug.vold.behaviour ""
unlock "Unlocking"
expect_status 0
expect_equal "the result property" success "$(result_property)"
step "The data is mounted" volume_probe mount /data
expect_status 0
expect_photograph_whole
finish
