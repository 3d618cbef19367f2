# Without the rescue service a caller gets a clear error; once it is back, its answer
. /share/story.sh
. /share/credential.sh

prepare_metadata
printf '%s\n' "$password" | provision_credential --status 4

step "The service is stopped" setprop ctl.stop rescue_host
check "the service stops" wait_for 5 service_is rescue_host stopped
step_with_input "Asking without a service" "$password" sentrova verify
expect_status 3
expect_output_contains "SentrovaService"

step "The service is started again" setprop ctl.start rescue_host
check "the service starts" wait_for 5 service_is rescue_host running
step_with_input "The right password, after the restart" "$password" sentrova verify
expect_status 0
expect_output "the password is right"

step "The service manager dies, and with it the directory" setprop ctl.stop servicemanager
check "the service manager stops" wait_for 5 service_is servicemanager stopped
step_with_input "Asking without a service manager" "$password" sentrova verify
expect_status 3

step "The service manager is started again" setprop ctl.start servicemanager
step_with_input "The right password: the service is registered anew" "$password" sentrova verify
expect_status 0
expect_output "the password is right"

step "A password given as an argument is not repeated" sentrova verify open-sesame
expect_status 2
expect_equal "the password in the message" "" "$(echo "$output" | grep open-sesame)"

step "A service that does not exist" setprop ctl.start nobody
sleep 0.2
expect_equal "its state" "" "$(getprop init.svc.nobody)"
finish
