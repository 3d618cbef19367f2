#include "cli/property_commands.h"

#include <android-base/properties.h>
#include <sys/stat.h>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>
#include <string>

#include "cli/exit_status.h"
#include "cli/library_messages.h"
#include "cli/progress.h"
#include "cli/volume_table.h"
#include "recovery_utils/roots.h"
#include "recovery_utils/roots_ex.h"

namespace sentrova {
namespace {

constexpr char kBackupFolder[] = "/cache/recovery";

// What the property loader sets to "1" when it is done.
constexpr const char* kCompletions[] = {
    "recovery.properties.loaded",
    "recovery.backup_props.loaded",
    "recovery.persist_properties.loaded",
};

// An answer of before would end the library's wait for this one.
void forget_answers() {
  for (const char* completion : kCompletions) {
    android::base::SetProperty(completion, "0");
  }
}

// Calls the library with its volume table loaded and the folder of the backups there, if possible.
// Returns false, after saying so, where there is no table.
template <typename Call>
bool with_volumes(const Output& output, Call call) {
  note_unless_root(output);
  {
    const LibraryMessagesToStderr messages;
    const Progress progress("waiting for the property loader");
    if (!get_fstab_default().empty()) {
      if (ensure_path_mounted("/cache") == 0) {
        mkdir(kBackupFolder, 0755);
      }
      forget_answers();
      call();
      return true;
    }
  }
  output.error("the device's volume table cannot be read; the messages tell why");
  return false;
}

bool is_ready(const char* property) {
  return android::base::GetProperty(property, "") == "true";
}

ExitStatus show_vendor_properties(const Output& output) {
  const bool oem = is_ready("recovery.oem_properties.ready");
  const bool kcf = is_ready("recovery.kcf_properties.ready");
  output.result(std::string("oem properties: ") + (oem ? "ready" : "not ready") +
                    "; kcf properties: " + (kcf ? "ready" : "not ready"),
                {{"oem_ready", oem}, {"kcf_ready", kcf}});
  return oem ? kExitSuccess : kExitAnswerIsNo;
}

ExitStatus load_properties(const Output& output) {
  return with_volumes(output, zuno_load_property) ? show_vendor_properties(output)
                                                  : kExitServiceFailed;
}

ExitStatus back_up_properties(const Output& output) {
  return with_volumes(output, zunoPropertyPrebackup) ? show_vendor_properties(output)
                                                     : kExitServiceFailed;
}

ExitStatus clear_property_backups(const Output& output) {
  if (!with_volumes(output, zunoPropertyPostBackup)) {
    return kExitServiceFailed;
  }
  output.result("the backups are removed", {{"cleared", true}});
  return kExitSuccess;
}

ExitStatus load_persistent_properties(const Output& output) {
  bool ready = false;
  if (!with_volumes(output, [&] { ready = zuno_load_persist_property(); })) {
    return kExitServiceFailed;
  }
  output.result(
      ready ? "the persistent properties are loaded" : "the persistent properties are not ready",
      {{"persistent_ready", ready}});
  return ready ? kExitSuccess : kExitAnswerIsNo;
}

struct PropertyVerb {
  const char* name;
  const char* help;
  ExitStatus (*command)(const Output& output);
};

constexpr PropertyVerb kPropertyVerbs[] = {
    {"load", "Load them from the vendor's partitions, else from the backups", load_properties},
    {"backup", "Back up their files, or load the backups where they are not ready",
     back_up_properties},
    {"clear", "Remove the backups", clear_property_backups},
    {"persist", "Load the persistent properties from the data partition",
     load_persistent_properties},
};

}  // namespace

void add_property_commands(CLI::App& app, const Output& output, int& status) {
  CLI::App* const properties =
      app.add_subcommand("properties", "Load or back up the vendor's properties");
  properties->require_subcommand(1);
  for (const PropertyVerb& verb : kPropertyVerbs) {
    properties->add_subcommand(verb.name, verb.help)->callback([&verb, &output, &status] {
      status = verb.command(output);
    });
  }
}

}  // namespace sentrova
