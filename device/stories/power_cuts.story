# Power is cut at ten points of an unlock: the next start unlocks cleanly, and nothing is lost
# disk: fbe_metadata_password
. /share/story.sh
. /share/credential.sh
. /share/host.sh
. /share/owner_data.sh

cuts=10
boot=$(cat /share/boot)
diary=/data/media/0/diary

lock() {
  step "The data is locked again" lock_userdata
  expect_status 0
}

# The unlocks that are cut are no first ones since the start: a first one takes longer.
measure_unlock() {
  lock
  unlock_begin=$(now)
  unlock "How long does it take?" "$password"
  expect_status 0
  echo $((($(now) - unlock_begin) * 10)) >/share/unlock_milliseconds
}

# Tells how far the unlock had come that was cut.
look_back() {
  echo "    seen before the cut: $(tail -n 1 /share/cut_unlock.log)"
  ! grep -q "readable now" /share/cut_unlock.log || echo "$boot" >>/share/late_cuts
}

echo "= start $boot"
[ "$boot" = 1 ] || look_back
unlock "The right password" "$password"
expect_status 0
expect_photograph_whole
expect_equal "what was kept before" "$(seq 1 $((boot - 1)))" "$(cat $diary 2>/dev/null)"
if [ "$boot" -gt $cuts ]; then
  touch /share/late_cuts
  check "most cuts came before the unlock's end" [ "$(wc -l </share/late_cuts)" -lt 5 ]
  finish
fi

[ "$boot" != 1 ] || measure_unlock
echo "$boot" >>$diary && sync
lock
: >/share/cut_unlock.log
cut_power_after $(($(cat /share/unlock_milliseconds) * (2 * boot - 1) / (2 * cuts)))
printf '%s\n' "$password" | sentrova unlock >/share/cut_unlock.log 2>&1
# No cut came.
sleep 60
