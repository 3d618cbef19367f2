# An owner with a password, for stories that ask the rescue service about it.

password='correct horse battery staple'
# What still tells of it where freed memory has been used for something short.
password_tail='tery staple'
wrong_password='correct horse battery stapl'

# Gives the metadata partition its file system and mounts it.
prepare_metadata() {
  /system/bin/mke2fs -q -F -t ext4 /dev/block/by-name/metadata &&
    mount -t ext4 /dev/block/by-name/metadata /metadata
}
