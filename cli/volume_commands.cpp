#include "cli/volume_commands.h"

#include <CLI/CLI.hpp>
#include <memory>
#include <string>

#include "cli/datadump_commands.h"
#include "cli/format_command.h"
#include "cli/holders_command.h"
#include "cli/mount_commands.h"
#include "cli/search_commands.h"
#include "cli/volume_list.h"

namespace sentrova {
namespace {

// What a verb does, in the list of verbs, and what its own help says besides.
struct Help {
  const char* summary;
  const char* details;
};

constexpr Help kVolumesHelp = {
    "List the volumes, what is mounted of them and how full that is",
    "Where standard output is not a terminal there is one line a volume: mount point, file "
    "system,\n"
    "device, what is mounted (\"yes\", another device, or \"-\"), and size, used and free bytes,\n"
    "parted by tabs. /data is not left mounted if it was not before."};
constexpr Help kMountHelp = {
    "Mount the volume that holds a path",
    "/otg is waited for, up to a minute. A volume that is mounted stays as it is."};
constexpr Help kUnmountHelp = {"Unmount a volume",
                               "A volume that is not mounted counts as unmounted. --force goes by "
                               "the text of the path: where\n"
                               "/data stays busy, those who hold /data2 are ended, too."};
constexpr Help kHoldersHelp = {
    "List the processes that hold a path or what is below it",
    "Shown are the process id, the program, by what it holds it (descriptor with its number,\n"
    "mapping, cwd, root, exe) and the path; parted by tabs where standard output is not a "
    "terminal.\n"
    "Nothing is signalled. Exit status 1 when nothing holds it."};
constexpr Help kFormatHelp = {
    "Make a fresh file system on a volume: all that is on it is lost",
    "Says on standard error which device it is, which file system it gets and what is mounted\n"
    "there, and goes on only after \"yes\" on a terminal or with --yes. The volume is unmounted\n"
    "first, by force if need be (see unmount)."};
constexpr Help kFindHelp = {"Find a file by its name in a directory and all below it",
                            "Shows the path of the first. Exit status 1 when there is none."};
constexpr Help kOtgHelp = {"Switch the USB port to host mode and wait for a disk",
                           "Waits for a minute at most. Exit status 1 when none came."};
constexpr Help kSdcardHelp = {"Show the block device of the SD card",
                              "Exit status 1 when there is none."};
constexpr Help kDatadumpHelp = {"Show or change whether a dump of the user data partition is armed",
                                "The flags outlive reboots and formats."};

// Shared with the callbacks, which outlive the functions that add them.
struct Arguments {
  std::string first;
  std::string second;
  bool flag = false;
};

class Commands {
 public:
  Commands(CLI::App& app, const Output& output, int& status)
      : app_(app), output_(output), status_(status) {}

  void add_listing() {
    add("volumes", kVolumesHelp)->callback(run(list_volumes));
    add("otg", kOtgHelp)->callback(run(find_otg_disk));
    add("sdcard", kSdcardHelp)->callback(run(find_sd_card));
  }

  void add_mounting() {
    const auto arguments = std::make_shared<Arguments>();
    CLI::App* const mount = add("mount", kMountHelp);
    mount->add_option("path", arguments->first, "A path on the volume")->required();
    mount->callback([=, &output = output_, &status = status_] {
      status = mount_volume(arguments->first, output);
    });
    CLI::App* const unmount = add("unmount", kUnmountHelp);
    unmount->add_option("path", arguments->first, "The volume's mount point")->required();
    unmount->add_flag(
        "--force", arguments->flag,
        "End the processes that hold the volume, where it stays busy for two seconds");
    unmount->callback([=, &output = output_, &status = status_] {
      status = unmount_volume(arguments->first, arguments->flag, output);
    });
    CLI::App* const holders = add("holders", kHoldersHelp);
    holders->add_option("path", arguments->first, "The path")->required();
    holders->callback([=, &output = output_, &status = status_] {
      status = show_holders(arguments->first, output);
    });
  }

  void add_formatting() {
    const auto arguments = std::make_shared<Arguments>();
    CLI::App* const format = add("format", kFormatHelp);
    format->add_option("volume", arguments->first, "The volume's mount point")->required();
    format->add_option("--from", arguments->second, "Fill the new file system from this directory")
        ->check(CLI::ExistingDirectory);
    format->add_flag("--yes", arguments->flag,
                     "Do not ask; without a terminal nothing is done otherwise");
    format->callback([=, &output = output_, &status = status_] {
      status = format_volume_of_table(arguments->first, arguments->second, arguments->flag, output);
    });
  }

  void add_finding() {
    const auto arguments = std::make_shared<Arguments>();
    CLI::App* const find = add("find", kFindHelp);
    find->add_option("name", arguments->first, "The file's whole name")->required();
    find->add_option("directory", arguments->second, "Where to begin")->required();
    find->callback([=, &output = output_, &status = status_] {
      status = find_file(arguments->first, arguments->second, output);
    });
  }

  void add_datadump() {
    const auto arguments = std::make_shared<Arguments>();
    CLI::App* const datadump = add("datadump", kDatadumpHelp);
    datadump->require_subcommand(1);
    datadump->add_subcommand("status", "Show it")->callback(run(show_datadump));
    datadump->add_subcommand("enable", "Arm the dump, without an offset")
        ->callback(run(enable_datadump));
    datadump->add_subcommand("disable", "Disarm the dump")->callback(run(disable_datadump));
    CLI::App* const resize = datadump->add_subcommand("resize", "Set the offset of an armed dump");
    resize->add_option("offset", arguments->first, "The offset; 0 clears it, 0x... is hexadecimal")
        ->required();
    resize->callback([=, &output = output_, &status = status_] {
      status = resize_datadump(arguments->first, output);
    });
  }

 private:
  CLI::App* add(const char* name, const Help& help) {
    return app_.add_subcommand(name, help.summary)
        ->footer(std::string(help.details) + "\n\n" + app_.get_footer());
  }

  std::function<void()> run(ExitStatus (*command)(const Output& output)) const {
    return [command, &output = output_, &status = status_] { status = command(output); };
  }

  CLI::App& app_;
  const Output& output_;
  int& status_;
};

}  // namespace

void add_volume_commands(CLI::App& app, const Output& output, int& status) {
  Commands commands(app, output, status);
  commands.add_listing();
  commands.add_mounting();
  commands.add_formatting();
  commands.add_finding();
  commands.add_datadump();
}

}  // namespace sentrova
