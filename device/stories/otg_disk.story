# A USB disk is found, plugged in before or after its port is switched to host mode
# devices: usb
. /share/story.sh
. /share/host.sh

# The node of the whole disk comes some milliseconds before that of its partition; a look that falls
# in between finds the disk.
disk=/dev/block/sda
partition=/dev/block/sda1
port=/sys/devices/platform/soc/a600000.ssusb
driver=/sys/bus/pci/drivers/xhci_hcd
controller=$(cd "$driver" && echo 0000:*)

# The port's controller is off until the port's host_mode file says that it is enabled.
make_port() {
  echo "$controller" >"$driver/unbind" && mount -t tmpfs tmpfs "$port" && : >"$port/host_mode"
}
host_mode_enabled() { [ "$(cat "$port/host_mode")" = enabled ]; }
role_switch() {
  wait_for 30 host_mode_enabled && echo "$controller" >"$driver/bind"
}

write_fstab
setprop ro.zuno.product.solution QCOM
setprop ro.zuno.product.platform SM8250
# No second for the disk to come to rest: emulated ones are there at once.
echo 0 >/sys/module/usb_storage/parameters/delay_use

step "The port is in device mode" make_port
expect_status 0
step "A disk is plugged in" ask_host plug_usb
expect_status 0
sleep 1
check "the disk is not seen in device mode" absent "$disk"

role_switch &
step "A disk that is there from the start" timeout 30 volume_probe otg
expect_status 0
expect_output_contains "Find the otg otg enable file: $port/host_mode"
expect_output_contains "I: find otg device $disk"
expect_equal "what was written to host_mode" enabled "$(cat "$port/host_mode")"
expect_equal "the disk's partition" usb-disk "$(partition_name "$partition")"
step "It takes a file" put_file "$partition" /otg
expect_status 0

step "The disk is pulled out" ask_host unplug_usb
expect_status 0
check "the disk goes" wait_for 5 absent "$disk"

: >"$port/host_mode"
start_probe otg
check "the library reports twice that it waits" \
  wait_for 20 logged 2 "can't find otg device $disk,"
expect_equal "what was written to host_mode again" enabled "$(cat "$port/host_mode")"
check "the library still waits" probe_runs
step "The disk is plugged in while the library waits for it" ask_host plug_usb
expect_status 0
end_of_probe "The library finds it"
expect_status 0
expect_output_contains "I: find otg device $disk"
step "It is the same disk" show_file "$partition" /otg
expect_status 0
expect_output "kept here"
finish
