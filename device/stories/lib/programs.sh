# Runs the test programs that /share/programs lists, by their paths under /build; leaves the report,
# the output and the exit status of each in /share/reports.

cd /tmp || exit 1
while read -r program; do
  base=/share/reports/$(echo "$program" | tr / -)
  timeout -s KILL 120 "/build/$program" "--gtest_output=json:$base.json" \
    </dev/null >"$base.log" 2>&1
  echo $? >"$base.status"
done </share/programs
