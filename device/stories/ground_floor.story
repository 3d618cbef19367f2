# A person's password is checked by the rescue service, over the kernel's binder
. /share/story.sh
. /share/credential.sh

step "The metadata partition gets its file system" prepare_metadata
expect_status 0
step_with_input "The owner sets a password" "$password" provision_credential --status 4
expect_status 0

step "What locks the data?" sentrova password-type
[ "$status" -ne 0 ] || note_moment "first answered call"
expect_status 0
expect_output "a credential is set (type 2)"

step_with_input "The right password" "$password" sentrova verify
expect_status 0
expect_output "the password is right"
step_with_input "A wrong password" "correct horse batterz" sentrova verify
expect_status 1
expect_output "the password is wrong"
step_with_input "An empty password" "" sentrova verify
expect_status 1
expect_output "the password is wrong"
step_with_input "The right password, once more" "$password" sentrova verify
expect_status 0
expect_output "the password is right"

expect_file_lacks /share/rescue_host.log "$password"
expect_file_lacks /share/servicemanager.log "$password"
finish
