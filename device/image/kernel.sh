# shellcheck shell=bash
# The component `kernel`: Debian's arm64 kernel, whichever version its package names, and the
# modules that the device loads, with their loading order in modules/load.list.

kernel_inputs=(modules.txt packages.sh kernel.sh apt_sources.py module_order.py)

build_kernel() {
  local out=$1 version module names
  mkdir "$out/unpacked" "$out/modules"
  unpack_packages "$out/unpacked" linux-image-arm64 ./boot ./lib/modules
  version=$(ls "$out/unpacked/lib/modules")
  mv "$out/unpacked/boot/vmlinuz-$version" "$out/vmlinuz"
  depmod -b "$out/unpacked" "$version"
  mapfile -t names < <(read_list "$image_source/modules.txt" '\n')
  python3 "$image_source/module_order.py" "$out/unpacked/lib/modules/$version" "${names[@]}" \
    >"$out/modules.order"
  while IFS= read -r module; do
    aarch64-linux-gnu-strip --strip-debug -o "$out/modules/${module##*/}" \
      "$out/unpacked/lib/modules/$version/$module"
    echo "${module##*/}" >>"$out/modules/load.list"
  done <"$out/modules.order"
  rm -rf "$out/unpacked" "$out/modules.order"
}
