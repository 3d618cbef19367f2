# shellcheck shell=bash
# The component `rootfs`: the userland under the rescue device's names, with the kernel's modules,
# packed as rootfs.cpio.lz4. The project's own programs come on top of it (see ../CMakeLists.txt).

rootfs_inputs=(runtime_packages.txt packages.sh rootfs.sh apt_sources.py default.prop
  "${kernel_inputs[@]}")

# What no program on the device reads; libbacktrace needs 7z.so of p7zip, nothing else of it.
prune_rootfs() {
  local root=$1 libraries=usr/lib/aarch64-linux-gnu
  find "$root/usr/lib/p7zip" -mindepth 1 ! -name 7z.so -delete
  (
    cd "$root" || exit
    mv etc/mke2fs.conf .
    rm -rf boot etc home media opt root srv var usr/games usr/share usr/libexec usr/include
    rm -rf usr/bin/7* usr/lib/{locale,ssl,tmpfiles.d,systemd,udev} lib/{systemd,udev}
    rm -rf "$libraries"/{gconv,engines-3,ossl-modules,e2initrd_helper}
    rm -rf lib/aarch64-linux-gnu/lib{BrokenLocale,anl,c_malloc_debug,memusage,nsl,nss_,pcprofile,thread_db}*
    mkdir etc
    mv mke2fs.conf etc/
  )
}

# The mount points and folders that a rescue device has.
make_folders() {
  (
    cd "$1" || exit
    mkdir -p cache data dev etc kcf metadata oem odm/etc proc share sys tmp build \
      mnt/{sdcard,otg,vendor} system/{bin,etc,lib64} vendor/{bin,etc,lib64} lib/modules
  )
}

# Links the tools under the names by which the platform calls them.
link_tools() {
  local root=$1 tool applet
  ln -s /bin/busybox "$root/system/bin/sh"
  for tool in mke2fs e2fsck tune2fs resize2fs dmsetup fsck.f2fs mkfs.vfat; do
    ln -s "/sbin/$tool" "$root/system/bin/$tool"
  done
  ln -s /usr/sbin/mkfs.exfat "$root/system/bin/mkfs.exfat"
  ln -s /sbin/mkfs.f2fs "$root/system/bin/make_f2fs"
  # The f2fs tool knows its part by its own name: a link under another name would not do.
  printf '#!/system/bin/sh\nexec /sbin/sload.f2fs "$@"\n' >"$root/system/bin/sload_f2fs"
  chmod 755 "$root/system/bin/sload_f2fs"
  # For scripts that name their interpreter or a tool by path; the shell itself needs no links.
  for applet in sh cat cp ls mount umount kill; do
    [ -e "$root/bin/$applet" ] || ln -s busybox "$root/bin/$applet"
  done
}

build_rootfs() {
  local out=$1 root="$1/root"
  update_component kernel
  mkdir "$root"
  unpack_packages "$root" "$(read_list "$image_source/runtime_packages.txt" ,)"
  prune_rootfs "$root"
  make_folders "$root"
  link_tools "$root"
  cp "$image_source/default.prop" "$root/default.prop"
  cp "$image_output/kernel/modules/"* "$root/lib/modules/"
  ln -s system/bin/init "$root/init"
  (cd "$root" && find . | LC_ALL=C sort | cpio -o -H newc --quiet --reproducible -R 0:0) |
    lz4 -l -9 -q >"$out/rootfs.cpio.lz4"
  rm -rf "$root"
}
