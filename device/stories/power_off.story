# The device powers off, with a reason
# ends: shutdown,thermal
. /share/story.sh

# Of no meaning to a device that does not start again.
setprop ro.boot.quiescent 1
expect_equal "how the device was booted" 1 "$(getprop ro.boot.quiescent)"
finish_by sentrova shutdown thermal
