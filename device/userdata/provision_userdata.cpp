// Makes a partition with user data on it, for stories and tests; see kHelp.

#include <android-base/logging.h>
#include <getopt.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include "common/wipe.h"
#include "device/userdata/provisioning.h"
#include "device/zunofscrypt/wrapped_key.h"
#include "device/zunogatekeeper/password_input.h"

namespace {

using sentrova::Places;
using sentrova::UserDataRequest;

constexpr int kDone = 0;
constexpr int kFailed = 1;
constexpr int kUsageError = 2;

constexpr char kHelp[] =
    "Usage: provision_userdata --kind KIND --file-system TYPE [--password] [--device PATH]\n"
    "                          [--digest-file PATH]\n"
    "Makes user data with sample files on a partition, in place of all that was there, and prints\n"
    "the fstab that leads to it. The metadata partition must be mounted at /metadata.\n"
    "\n"
    "  --kind KIND         fbe-metadata  files encrypted, and behind metadata encryption\n"
    "                      fbe           files encrypted\n"
    "                      fde           full-disk encryption, key in the footer\n"
    "                      plain         not encrypted\n"
    "  --file-system TYPE  f2fs or ext4\n"
    "  --password          the owner has a lock-screen password: one line of standard input\n"
    "  --device PATH       the partition (default: /dev/block/by-name/userdata)\n"
    "  --digest-file PATH  where the digest of the photograph among the files goes, as sha256sum\n"
    "                      takes it (default: /metadata/photograph.sha256); it holds the\n"
    "                      photograph's path in plain text\n"
    "  --help              show this text\n"
    "\n"
    "Exit status: 0 done, 1 the user data could not be made, 2 wrong arguments or no usable\n"
    "password.\n";

struct Arguments {
  UserDataRequest request;
  bool has_kind = false;
  bool has_password = false;
  bool help = false;
};

// Returns false if the arguments are not usable.
bool parse_arguments(int argc, char** argv, Arguments& arguments) {
  static const option kOptions[] = {{"kind", required_argument, nullptr, 'k'},
                                    {"file-system", required_argument, nullptr, 'f'},
                                    {"password", no_argument, nullptr, 'p'},
                                    {"device", required_argument, nullptr, 'd'},
                                    {"digest-file", required_argument, nullptr, 's'},
                                    {"help", no_argument, nullptr, 'h'},
                                    {nullptr, 0, nullptr, 0}};
  UserDataRequest& request = arguments.request;
  for (int found = 0; (found = getopt_long(argc, argv, "", kOptions, nullptr)) != -1;) {
    if (found == 'k') {
      const auto kind = sentrova::parse_kind(optarg);
      arguments.has_kind = kind.has_value();
      request.kind = kind.value_or(request.kind);
    } else if (found == 'f') {
      request.file_system = optarg;
    } else if (found == 'p') {
      arguments.has_password = true;
    } else if (found == 'd') {
      request.block_device = optarg;
    } else if (found == 's') {
      request.digest_file = optarg;
    } else if (found == 'h') {
      arguments.help = true;
    } else {
      return false;
    }
  }
  return arguments.help || (optind == argc && arguments.has_kind &&
                            (request.file_system == "f2fs" || request.file_system == "ext4"));
}

// Keys in the initial file system would be gone at the next start, and the user data with them.
bool is_mount_point(const std::string& path) {
  struct stat top = {};
  struct stat parent = {};
  return stat(path.c_str(), &top) == 0 && stat((path + "/..").c_str(), &parent) == 0 &&
         top.st_dev != parent.st_dev;
}

int provision(const Arguments& arguments) {
  const Places places;
  std::string secret = sentrova::kAbsentCredential;
  const sentrova::WipeOnExit wipe_secret(secret);
  if (arguments.has_password) {
    secret.clear();
    if (!sentrova::read_password(STDIN_FILENO, secret)) {
      fputs("provision_userdata: no usable password on standard input\n", stderr);
      return kUsageError;
    }
  }
  std::string error = places.metadata + " is not mounted";
  if (!is_mount_point(places.metadata) ||
      !sentrova::provision_user_data(places, arguments.request, secret, error)) {
    fprintf(stderr, "provision_userdata: %s\n", error.c_str());
    return kFailed;
  }
  fputs(sentrova::fstab_text(places, arguments.request).c_str(), stdout);
  return kDone;
}

}  // namespace

int main(int argc, char** argv) {
  android::base::InitLogging(argv, android::base::StderrLogger);
  Arguments arguments;
  if (!parse_arguments(argc, argv, arguments)) {
    fputs("provision_userdata: wrong arguments; --help shows what is right\n", stderr);
    return kUsageError;
  }
  if (arguments.help) {
    fputs(kHelp, stdout);
    return kDone;
  }
  return provision(arguments);
}
