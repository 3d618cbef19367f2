# The device reboots into recovery, quietly as it was booted
# ends: reboot,recovery,quiescent
. /share/story.sh

setprop ro.boot.quiescent 1
too_long=$(printf '%0100d' 0)
step "Power off, for a reason too long to be handed on" sentrova shutdown "$too_long"
expect_status 4
expect_equal "what init was asked" "" "$(getprop sys.powerctl)"
finish_by sentrova reboot recovery
