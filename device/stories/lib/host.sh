# Words for stories that need something of the host, as disks to be plugged in and pulled out (see
# device/host_requests.py and device/removable_media.py).

volumes_log=/tmp/volumes.log

# ask_host REQUEST [ARGUMENT]: status 1, with the reason, if the host cannot or does not answer.
ask_host() {
  rm -f "/share/requests/$1.failed"
  printf %s "${2-}" >/share/request && mv /share/request "/share/requests/$1"
  wait_for 10 absent "/share/requests/$1" || {
    echo "no answer from the host"
    return 1
  }
  [ ! -e "/share/requests/$1.failed" ] || {
    cat "/share/requests/$1.failed"
    return 1
  }
}

# cut_power_after MILLISECONDS: returns at once. The device then starts anew and runs the story from
# its beginning; the counts go on.
cut_power_after() {
  echo "$passed $failed" >/share/counts
  echo "* The power is cut after $1 ms"
  printf %s "$1" >/share/request && mv /share/request /share/requests/cut_power
}

present() { [ -e "$1" ]; }
absent() { [ ! -e "$1" ]; }

# The device's volumes; the removable ones are not among them.
write_fstab() {
  echo "/dev/block/by-name/metadata /metadata ext4 noatime wait" >/etc/recovery.fstab
}

partition_name() { sed -n s/^PARTNAME=//p "/sys/class/block/${1##*/}/uevent"; }

# start_probe VERB...: lets volume_probe wait in the background, for half a minute at most.
start_probe() {
  timeout 30 volume_probe "$@" >"$volumes_log" 2>&1 &
  probe=$!
}

probe_runs() { kill -0 "$probe"; }

# logged COUNT TEXT: so many lines of the probe's, or more, hold the text.
logged() { [ "$(grep -cF -- "$2" "$volumes_log")" -ge "$1" ]; }

# end_of_probe TEXT: waits for the probe's end, which it shows like a step, of a good one only the
# last line.
end_of_probe() {
  begin=$(now)
  wait "$probe"
  status=$?
  taken=$(($(now) - begin))
  output=$(cat "$volumes_log")
  printf '* %s (%d.%02d s)\n' "$1" $((taken / 100)) $((taken % 100))
  if [ "$status" -eq 0 ]; then
    echo "$output" | tail -n 1
  else
    echo "$output"
    echo "exit status $status"
  fi | sed 's/^/    /'
}

# put_file DISK FOLDER: gives the disk a file system with a file in it.
put_file() {
  /system/bin/mkfs.vfat "$1" >/tmp/mkfs.log 2>&1 || {
    cat /tmp/mkfs.log
    return 1
  }
  mount -t vfat "$1" "$2" && echo "kept here" >"$2/note" && umount "$2"
}

# show_file DISK FOLDER: prints the file.
show_file() { mount -t vfat -o ro "$1" "$2" && cat "$2/note" && umount "$2"; }
