# What the rescue service leaves behind: time that it took, and no trace of a password.

# The time spent in the first call of each operation, but not in the vendor's libraries, by the loading
# program's log.
library_microseconds() {
  awk '/ us of them in the vendor/ && !seen[$2]++ { sum += $4 - $6 } END { print sum }' \
    /share/rescue_host.log
}

expect_library_time_below_milliseconds() {
  taken=$(library_microseconds)
  echo "* Of that unlock, the library itself took $taken us"
  check "at most $1 ms" [ "$taken" -le $(($1 * 1000)) ]
}

# Expects that nothing but the store of the credential, which holds a digest, tells the password.
expect_no_trace_of_password() {
  for log in /share/*.log; do
    expect_file_lacks "$log" "$password_tail"
  done
  check "the kernel's log has no password" fails sh -c "dmesg | grep -qF '$password_tail'"
  for program in rescue_host servicemanager; do
    step_with_input "The password in the memory of $program" "$password_tail" \
      memory_search "$(pidof $program)"
    expect_status 0
  done
  # That such a search finds what is there:
  step_with_input "The service's name in the memory of rescue_host" SentrovaService \
    memory_search "$(pidof rescue_host)"
  expect_status 1
  expect_output_contains "found as UTF-8"
  expect_output_contains "found as UTF-16"
}
