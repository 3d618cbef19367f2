# The words in which stories are written. A story reads this file first, tells its steps one after
# the other, each followed by what is expected of it, and ends with `finish`.

passed=0
failed=0
# The counts of the starts before this one.
[ ! -e /share/counts ] || read -r passed failed </share/counts
status=0
output=

# Hundredths of a second since the device's start.
now() {
  read -r uptime _ </proc/uptime
  echo "${uptime%.*}${uptime#*.}"
}

# step TEXT COMMAND...: runs the command and shows what it printed, its status and its time. What it
# printed, errors included, is then in $output, its exit status in $status.
step() {
  text=$1
  shift
  begin=$(now)
  output=$("$@" 2>&1)
  status=$?
  taken=$(($(now) - begin))
  printf '* %s (%d.%02d s)\n' "$text" $((taken / 100)) $((taken % 100))
  [ -z "$output" ] || printf '%s\n' "$output" | sed 's/^/    /'
  [ "$status" -eq 0 ] || echo "    exit status $status"
}

# step_with_input TEXT INPUT COMMAND...: the same, with a line of standard input.
step_with_input() {
  text=$1
  input=$2
  shift 2
  printf '%s\n' "$input" >/tmp/input
  step "$text" run_with_input "$@"
  rm /tmp/input
}

run_with_input() { "$@" </tmp/input; }

check() {
  what=$1
  shift
  if "$@"; then
    passed=$((passed + 1))
  else
    failed=$((failed + 1))
    echo "    FAILED: $what"
  fi
}

expect_status() { check "expected exit status $1, not $status" [ "$status" -eq "$1" ]; }

expect_output() { check "expected the output: $1" [ "$output" = "$1" ]; }

expect_output_contains() {
  case $output in
    *"$1"*) check "" true ;;
    *) check "expected in the output: $1" false ;;
  esac
}

# expect_equal WHAT EXPECTED ACTUAL
expect_equal() { check "$1: expected '$2', not '$3'" [ "$2" = "$3" ]; }

lacks() { [ -r "$1" ] && ! grep -qF -- "$2" "$1"; }

# expect_file_lacks FILE TEXT: the file is there and does not hold the text.
expect_file_lacks() { check "expected $1 without: $2" lacks "$1" "$2"; }

# expect_file_has FILE TEXT
expect_file_has() { check "expected $1 with: $2" grep -qF -- "$2" "$1"; }

# wait_for SECONDS COMMAND...: runs the command until it succeeds; status 1 after so many seconds.
wait_for() {
  wait_end=$(($(now) + $1 * 100))
  shift
  until "$@"; do
    [ "$(now)" -lt "$wait_end" ] || return 1
    sleep 0.05
  done
}

service_is() { [ "$(getprop "init.svc.$1")" = "$2" ]; }

# note_moment NAME: tells the host, which measures the time from power-on to here.
note_moment() { : >"/share/moments/$1"; }

finish() {
  echo "$passed passed, $failed failed"
  [ "$failed" -eq 0 ] || exit 1
  exit 0
}

# finish_by COMMAND...: ends the story with a command that ends the device, if nothing has failed. The
# host knows what to expect from the story's head.
finish_by() {
  echo "$passed passed, $failed failed"
  [ "$failed" -eq 0 ] || exit 1
  # The counts stay the last line, whether or not the command lives to say something.
  "$@" >/dev/null
  exit 1
}
