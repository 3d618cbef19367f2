# shellcheck shell=bash
# The component `sysroot`: headers and libraries that the cross build links against.

sysroot_inputs=(sysroot_packages.txt packages.sh sysroot.sh apt_sources.py)

build_sysroot() {
  local out=$1 link
  unpack_packages "$out" "$(read_list "$image_source/sysroot_packages.txt" ,)"
  # An absolute link would lead the linker to this machine's libraries.
  find "$out" -lname '/*' -path '*/lib/*' -print0 | while IFS= read -r -d '' link; do
    ln -sfnr "$out$(readlink "$link")" "$link"
  done
  rm -rf "${out:?}"/{boot,home,media,mnt,opt,proc,root,run,srv,sys,tmp,var} \
    "$out"/usr/share/{doc,man,locale,info,zoneinfo}
}
