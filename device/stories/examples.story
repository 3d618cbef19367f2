# The two examples instead of this project's programs: a loading program and a front end's client
. /share/story.sh
. /share/credential.sh

prepare_metadata
printf '%s\n' "$password" | provision_credential --status 4
setprop ctl.stop rescue_host
check "the rescue service of the device stops" wait_for 5 service_is rescue_host stopped

step_with_input "Asking without a service" "$password" example_client
expect_status 2
expect_output "client: there is no rescue service"

# The client waits until the loading program has registered the service.
example_host >/share/example_host.log 2>&1 &
host=$!
step_with_input "The right password" "$password" example_client
expect_status 0
expect_output "a credential of type 2 is set
the password is right"
step_with_input "A wrong password" "$wrong_password" example_client
expect_status 1
expect_output "a credential of type 2 is set
the password is wrong"
expect_file_lacks /share/example_host.log "$password"

step "The credential is taken away" provision_credential --status 0
expect_status 0
step "Asking once more" example_client
expect_status 0
expect_output "no credential is set"

kill "$host"
finish
