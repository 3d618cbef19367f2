# The field tool looks after every kind of volume, from the table to a format
# devices: usb sd
. /share/story.sh
. /share/host.sh

logdata=/dev/block/by-name/logdata
port=/sys/devices/platform/soc/a600000.ssusb
card=/dev/block/mmcblk1p1
disk=/dev/block/sda1
messages=/share/field_tool_messages.log
tab=$(printf '\t')
red=$(printf '\033[31mred')

# Only the answer; what else is said goes to the log.
tool() { sentrova "$@" 2>"$messages"; }
tool_in() { (cd "$1" && shift && tool "$@"); }
tool_unheard() { tool "$@" >&-; }

# expect_json POINTER VALUE: of the last step's answer, which is one JSON object.
expect_json() { expect_equal "$1" "$2" "$(echo "$output" | json_value "$1")"; }
expect_message() { expect_file_has "$messages" "$1"; }

mounted() { grep -q " $1 " /proc/mounts; }
not_mounted() { ! mounted "$1"; }
digest() { head -c 1000000 "$1" | sha256sum; }
runs() { kill -0 "$1" 2>/dev/null; }
gone() { ! runs "$1"; }

# The loading program mounts /data when it starts, which may be now.
setprop ctl.stop rescue_host
check "the service stops" wait_for 5 service_is rescue_host stopped
write_fstab
echo "/dev/block/by-name/userdata /data ext4 noatime wait" >>/etc/recovery.fstab
/system/bin/mke2fs -q -F -t ext4 /dev/block/by-name/userdata 100M
mkdir -p /tmp/seed /tmp/elsewhere
echo "kept here" >/tmp/seed/note

step "The volumes" tool volumes
expect_status 0
expect_output_contains "/cache${tab}ext4${tab}$logdata${tab}-${tab}-${tab}-${tab}-"
expect_message "recovery filesystem table"
check "looking leaves /data as it was" not_mounted /data
step "And with standard output closed" tool_unheard volumes
expect_status 4
expect_message "the answer could not be written"

before=$(digest "$logdata")
step "A format that nobody can confirm" tool --json format /cache </dev/null
expect_status 2
expect_json /error "nobody can be asked without a terminal; --yes goes on without asking"
expect_message "device       $logdata"
for target in /sdcard /nowhere /tmp; do
  step "A format of $target" tool format --yes "$target"
  expect_status 2
done
expect_equal "the volume's content" "$before" "$(digest "$logdata")"

step "The volume is formatted and filled" tool --json format --yes --from /tmp/seed /cache
expect_status 0
expect_json /file_system ext4
expect_json /userdata_reverted false
step "It is mounted" tool --json mount /cache/recovery
expect_status 0
expect_json /mounted/device "$logdata"
expect_json /was_mounted false
step "And once more" tool mount /cache/
expect_output "/cache was mounted before: ext4 on $logdata"
expect_equal "what it was filled with" "kept here" "$(cat /cache/note)"
step "The volumes now" tool --json volumes
expect_json /volumes/1/mount_point /data
expect_json /volumes/1/mounted null
expect_json /volumes/3/mount_point /cache
expect_json /volumes/3/mounted/file_system ext4
check "it has a size" [ "$(echo "$output" | json_value /volumes/3/mounted/size)" -gt 30000000 ]

step "A format with the volume's own files" tool format --yes --from /cache /cache
expect_status 2
expect_message "/cache lies on the volume itself"
mount -t ext4 "$logdata" /tmp/elsewhere
step "A format of what is mounted elsewhere" tool format --yes /cache
expect_status 2
expect_message "$logdata is mounted at /tmp/elsewhere too; unmount that first"
umount /tmp/elsewhere
step "A file is found" tool find note /cache/
expect_output /cache/note
step "Another is not" tool --json find note2 /cache
expect_status 1
expect_json /path null

step "Nothing holds the volume" tool --json holders /cache
expect_status 1
expect_json /unreadable_processes 0
cp /bin/busybox /cache/sleep
: >"/cache/$red"
(cd /cache && exec ./sleep 60 3<"$red") &
holder=$!
chroot /cache /sleep 60 &
prisoner=$!
sleep 0.5
step "Who holds it?" tool holders /cache
expect_status 0
for held in "cwd$tab/cache" "exe$tab/cache/sleep" "mapping$tab/cache/sleep" \
  "descriptor 3$tab/cache/\\x1b[31mred"; do
  expect_output_contains "$holder$tab./sleep$tab$held"
done
expect_output_contains "$prisoner$tab/sleep${tab}root$tab/cache"
step "It is unmounted" tool --json unmount /cache
expect_status 4
expect_json /error "cannot unmount /cache; processes that hold it: 2 (\`sentrova holders /cache\` lists them)"
expect_json /mounted/device "$logdata"
for verb in "unmount --force" "format --yes"; do
  step "By force, from a folder of its own: $verb" tool_in /cache $verb /cache
  expect_status 2
  expect_message "/cache is held by this command"
done
check "its holders were let be" runs "$holder"
step "By force" tool --json unmount --force /cache
expect_status 0
expect_json /mounted null
check "its holders are gone" wait_for 5 gone "$holder"
check "it is not mounted" not_mounted /cache
step "Once more" tool unmount /cache
expect_output "nothing is mounted at /cache"
for verb in mount unmount; do
  step "$verb of no volume" tool "$verb" /nowhere
  expect_status 2
done

step "The data partition is mounted" tool mount /data
expect_status 0
check "/data is mounted" mounted /data
step "It is formatted while it is in use" tool --json format --yes /data
expect_status 0
expect_message "mounted      ext4 on /dev/block/by-name/userdata"
expect_json /mount_point /data

step "An offset for a dump that is not armed" tool datadump resize 4096
expect_status 4
step "The dump is armed" tool datadump enable
expect_output "the data dump is armed, without an offset"
step "Its offset" tool --json datadump resize 0x1000
expect_json /offset 4096
step "An offset that is none" tool datadump resize 12x
expect_status 2
step "It is as it was" tool datadump status
expect_output "the data dump is armed, with the offset 4096"
step "It is disarmed" tool --json datadump disable
expect_json /armed false

step "Is there a card?" tool --json sdcard
expect_status 1
expect_json /device null
ask_host insert_sd
check "a card comes" wait_for 5 present "$card"
step "And now?" tool sdcard
expect_output "$card"

mount -t tmpfs tmpfs "$port" && : >"$port/host_mode"
setprop ro.zuno.product.solution QCOM
setprop ro.zuno.product.platform SM8250
echo 0 >/sys/module/usb_storage/parameters/delay_use
sentrova --json otg >/tmp/otg.json 2>"$messages" &
waiting=$!
sleep 2
check "the tool waits for a disk" runs "$waiting"
ask_host plug_usb
wait "$waiting"
expect_equal "the tool's exit status" 0 $?
output=$(cat /tmp/otg.json)
expect_json /device "$disk"
put_file "$disk" /mnt/otg
step "The disk is mounted" tool --json mount /otg
expect_status 0
expect_json /mounted/file_system vfat
expect_equal "what is on it" "kept here" "$(cat /otg/note)"
step "And unmounted" tool unmount /otg
expect_output "/otg is unmounted"
finish
