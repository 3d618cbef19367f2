# shellcheck shell=bash
# The component `machine`: the device tree, QEMU's own for this machine and our nodes.

machine_inputs=(machine.args machine.dtsi machine.sh)

# QEMU's tree may change with QEMU.
machine_version() {
  qemu-system-aarch64 --version
}

build_machine() {
  local out=$1 args
  mapfile -t args < <(read_list "$image_source/machine.args" '\n')
  qemu-system-aarch64 "${args[@]}" -machine dumpdtb="$out/qemu.dtb" -nodefaults -display none \
    >"$out/qemu.log" 2>&1 || {
    cat "$out/qemu.log" >&2
    return 1
  }
  dtc -q -I dtb -O dts -o "$out/device.dts" "$out/qemu.dtb"
  cat "$image_source/machine.dtsi" >>"$out/device.dts"
  dtc -q -I dts -O dtb -o "$out/device.dtb" "$out/device.dts"
  rm "$out"/qemu.* "$out/device.dts"
}
