# Data that is not encrypted is readable as it is
# disk: plain
. /share/story.sh
. /share/host.sh
. /share/owner_data.sh

step "What is there?" sentrova status
expect_output_contains "encryption type: not set"
expect_output_contains "/data: ext4 on /dev/block/by-name/userdata"
unlock "Unlocking"
expect_status 0
expect_output_contains "the data is not encrypted"
expect_photograph_whole
# The other stories say that the raw disk does not hold these.
for text in "$photograph_name" "$photograph_text"; do
  step "Does the raw disk hold \"$text\"?" on_disk "$text"
  expect_status 0
done
finish
