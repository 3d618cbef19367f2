# The owner's data and what can be seen of it, for stories of unlocking it. The disk's maker left the
# photograph's digest and path.

digest_file=/share/disk/photograph.sha256
photograph=$(sed 's/^[^ ]*  //' "$digest_file")
photograph_name=${photograph##*/}
# Stands in the photograph as plain text.
photograph_text="An afternoon at the lake"

photograph_is_whole() { sha256sum -c "$digest_file"; }

# on_disk TEXT: whether the bytes of the text stand on the partition as they are. The host looks; the
# device would take minutes.
on_disk() {
  partition=/sys/class/block/$(basename "$(realpath /dev/block/by-name/userdata)")
  printf %s "$1" >/share/needle
  ask_host find_on_disk "$(cat "$partition/start") $(cat "$partition/size")"
}

# Expects that the raw disk tells neither the photograph's name nor what is in it.
expect_disk_hides_photograph() {
  for secret in "$photograph_name" "$photograph_text"; do
    step "Does the raw disk hold \"$secret\"?" on_disk "$secret"
    expect_output "not on the disk"
  done
}

mounted() { grep -q " $1 " /proc/mounts; }

# Expects that nothing is mounted at /data.
expect_data_not_mounted() { check "/data is not mounted" fails mounted /data; }

# Expects that of /data, mounted, neither the photograph's name nor any file of its storage shows.
expect_photograph_locked() {
  check "the photograph's path leads nowhere" fails [ -e "$photograph" ]
  expect_equal "files of that name" "" "$(find /data -name "$photograph_name")"
  check "there is something, under names that tell nothing" [ -n "$(ls /data/media/0)" ]
  expect_equal "files that can be read" "" \
    "$(find /data/media /data/user -type f -exec cat {} + 2>/dev/null)"
}

fails() { ! "$@"; }

expect_photograph_whole() {
  step "The photograph's digest" photograph_is_whole
  expect_status 0
}

# unlock TEXT [PASSWORD]: the whole way, as a person goes it.
unlock() { step_with_input "$1" "${2-}" sentrova unlock; }

result_property() { getprop recovery.crypto.decrypt.result; }

restart_rescue_host() {
  setprop ctl.stop rescue_host
  wait_for 5 service_is rescue_host stopped
  setprop ctl.start rescue_host
  wait_for 5 service_is rescue_host running
}
