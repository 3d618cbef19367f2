# How the disks of disks/ are made.

facts=/share/disk

# make_disk PASSWORD ARGUMENTS...: gives the owner the password (none, where it is empty) and user
# data of the kind that the arguments of provision_userdata tell.
make_disk() {
  owner_password=$1
  shift
  step "The metadata partition gets its file system" prepare_metadata
  expect_status 0
  if [ -n "$owner_password" ]; then
    step_with_input "The owner sets a password" "$owner_password" provision_credential --status 4
    expect_status 0
    step_with_input "The owner's data" "$owner_password" provision_userdata --password "$@"
  else
    step "The owner has no credential" provision_credential --status 0
    expect_status 0
    step "The owner's data" provision_userdata "$@"
  fi
  expect_status 0
  echo "$output" >"$facts/recovery.fstab"
  cp /metadata/photograph.sha256 "$facts/"
  umount /metadata
}
