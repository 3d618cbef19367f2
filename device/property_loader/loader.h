#pragma once

namespace sentrova::device {

// The property loader: reads property files at the volume layer's request
// (recovery_utils/roots_ex.h) and sets what they hold.
//
// A request is a property of the value "1":
//
//   request                      files                                    sets when done
//   recovery.load.props          oem.prop in /oem or /vendor/oem, recovery.properties.loaded
//                                kcf.prop in /kcf or /vendor/kcf
//   recovery.load.backup_props   oem.prop and kcf.prop in /cache/recovery
//   recovery.backup_props.loaded recovery.load.persist_props  /data/property/persistent_properties
//   recovery.persist_properties.loaded
//
// A request is taken by setting it to "0" and its completion to "0" before anything is read; "1" in
// the completion property tells that all is done, well or not. How it went is told for each file by
// "recovery.oem_properties.ready", "recovery.kcf_properties.ready" and
// "recovery.persistent_properties.ready": "true", or "false" where the file cannot be read or holds
// no property. The text of a vendor file that was loaded is in /tmp/oem.prop or /tmp/kcf.prop
// before its ready property is "true"; of one that was not, what was there stays there.
//
// Names that steer the device ("ctl.", "sys.powerctl") or belong to this handshake ("recovery.")
// are not set from a file, nor is anything but "persist." from the persistent ones.
//
// Answers each request that stands. One thread.
void answer_requests();

// Sets the three completion properties to "0", so that an answer of before is not taken for one of
// now.
void withdraw_answers();

}  // namespace sentrova::device
