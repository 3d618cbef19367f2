# An owner with a password, for stories that ask the rescue service about it.

password='correct horse battery'

# Gives the metadata partition its file system and mounts it.
prepare_metadata() {
  /system/bin/mke2fs -q -F -t ext4 /dev/block/by-name/metadata &&
    mount -t ext4 /dev/block/by-name/metadata /metadata
}
