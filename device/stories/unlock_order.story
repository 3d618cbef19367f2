# Unlocking out of order, twice, in twos, with a client that dies, and a hundred wrong passwords
# disk: fbe_metadata_password
. /share/story.sh
. /share/credential.sh
. /share/host.sh
. /share/owner_data.sh

open_files() { ls "/proc/$(pidof rescue_host)/fd" | wc -l; }
memory_kib() { awk '/^VmRSS:/ { print $2 }' "/proc/$(pidof rescue_host)/status"; }

lock() {
  step "The data is locked again" lock_userdata
  expect_status 0
  expect_data_not_mounted
}

step_with_input "The last step first" "$password" operation_call fbe-ce
expect_status 1
step "Then the one before it" operation_call fbe-de
expect_status 1
expect_equal "the result property" "" "$(result_property)"
expect_data_not_mounted
for operation in fbe-metadata fbe-de; do
  for time in once twice; do
    step "$operation, $time" operation_call $operation
    expect_status 0
  done
done
expect_photograph_locked

# Less work for the digest, so that this tests the service and not scrypt.
step_with_input "The password is stored anew" "$password" provision_credential --status 4 --cost 8
expect_status 0
printf '%s\n' "$wrong_password" | operation_call fbe-ce 10 >/dev/null
files=$(open_files)
memory=$(memory_kib)
step_with_input "A hundred wrong passwords" "$wrong_password" operation_call fbe-ce 100
expect_status 1
expect_equal "the service's open files" "$files" "$(open_files)"
check "it needs no more memory" [ "$(memory_kib)" -le $((memory + 64)) ]
expect_photograph_locked
for time in once twice; do
  step_with_input "The right password, $time" "$password" operation_call fbe-ce
  expect_status 0
done
expect_photograph_whole

calls() { grep -c "Starting keystore" /share/rescue_host.log; }
another_call() { [ "$(calls)" -gt "$calls_before" ]; }
kill_client_in_call() {
  calls_before=$(calls)
  operation_call fbe-metadata &
  client=$!
  check "the call has begun" wait_for 5 another_call
  kill -KILL "$client"
  wait "$client"
  client_end=$?
}
# A call takes milliseconds, so a kill on a busy machine may come after its end.
for attempt in 1 2 3 4 5; do
  lock
  kill_client_in_call
  [ "$client_end" -ne 0 ] && break
done
expect_equal "the end of a client in mid-call" 137 "$client_end"
check "its call is carried out" wait_for 5 mounted /data
unlock "Another client goes on" "$password"
expect_status 0
expect_photograph_whole

lock
printf '%s\n' "$password" >/tmp/password
sentrova unlock </tmp/password >/tmp/first.log 2>&1 &
first=$!
unlock "Two clients at once: the second" "$password"
expect_status 0
wait "$first"
expect_equal "the first client's status" 0 $?
expect_photograph_whole
finish
