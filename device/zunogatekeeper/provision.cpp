#include "device/zunogatekeeper/provision.h"

#include <android-base/parseint.h>
#include <android-base/properties.h>
#include <getopt.h>
#include <stdio.h>

#include <optional>
#include <string>

#include "common/wipe.h"
#include "device/zunogatekeeper/credential_store.h"
#include "device/zunogatekeeper/password_input.h"

namespace sentrova {
namespace {

constexpr int kDone = 0;
constexpr int kFailed = 1;
constexpr int kUsageError = 2;
constexpr int kUserId = 0;
// At r = 8 the table of 2^16 blocks is the largest that a reader accepts.
constexpr int kHighestCost = 16;

constexpr char kHelp[] =
    "Usage: provision_credential [--store PATH] --status N [--cost LOG2N]\n"
    "Makes the lock-screen credential store of user 0, in place of any that is there.\n"
    "\n"
    "  --status N    kind of credential: 0 none, 1 pattern, 2 PIN, 3 password, 4 and 5 others;\n"
    "                unless it is 0, the credential is read as one line from standard input\n"
    "                (1 to 1024 bytes, no NUL)\n"
    "  --store PATH  where the store is made (default: the property ro.rescue.credential_store,\n"
    "                else /metadata/credentials.db)\n"
    "  --cost LOG2N  binary logarithm of scrypt's N, 1 to 16 (default 14)\n"
    "  --help        show this text\n"
    "\n"
    "Exit status: 0 done, 1 the store could not be made, 2 wrong arguments or no usable "
    "password.\n";

struct Arguments {
  std::string store;
  int status = -1;
  ScryptCost cost;
  bool help = false;
};

// Returns false, after a message, if the arguments are not usable.
bool parse_arguments(int argc, char** argv, Arguments& arguments) {
  static const option kOptions[] = {{"store", required_argument, nullptr, 's'},
                                    {"status", required_argument, nullptr, 'k'},
                                    {"cost", required_argument, nullptr, 'c'},
                                    {"help", no_argument, nullptr, 'h'},
                                    {nullptr, 0, nullptr, 0}};
  optind = 0;  // glibc: begin anew, whatever was parsed before
  for (int found = 0; (found = getopt_long(argc, argv, "", kOptions, nullptr)) != -1;) {
    bool good = found != '?';
    if (found == 's') {
      arguments.store = optarg;
    } else if (found == 'k') {
      good = android::base::ParseInt(optarg, &arguments.status, kNoCredential, kHighestStatus);
    } else if (found == 'c') {
      good = android::base::ParseInt<int64_t>(optarg, &arguments.cost.log2_n, 1, kHighestCost);
    } else if (found == 'h') {
      arguments.help = true;
      return true;
    }
    if (!good) {
      fputs("provision_credential: wrong argument; --help shows what is right\n", stderr);
      return false;
    }
  }
  if (optind != argc || arguments.status < 0) {
    fputs("provision_credential: --status is needed, and options alone; see --help\n", stderr);
    return false;
  }
  return true;
}

// Fills in a fresh salt and the digest. Returns false where randomness or memory is not to be had.
bool add_digest(const std::string& password, Credential& credential) {
  const std::optional<Salt> salt = random_salt();
  if (!salt) {
    return false;
  }
  const std::optional<Digest> digest = derive_digest(password, *salt, credential.cost);
  if (!digest) {
    return false;
  }
  credential.salt = *salt;
  credential.digest = *digest;
  return true;
}

int make_store(const Arguments& arguments, int input_fd) {
  Credential credential = {.status = arguments.status, .cost = arguments.cost};
  if (arguments.status != kNoCredential) {
    std::string password;
    const WipeOnExit wipe_password(password);
    if (!read_password(input_fd, password)) {
      fputs("provision_credential: standard input has no line of 1 to 1024 bytes without NUL\n",
            stderr);
      return kUsageError;
    }
    if (!add_digest(password, credential)) {
      fputs("provision_credential: the digest could not be made\n", stderr);
      return kFailed;
    }
  }
  std::string error;
  if (!replace_store(arguments.store, kUserId, credential, error)) {
    fprintf(stderr, "provision_credential: %s: %s\n", arguments.store.c_str(), error.c_str());
    return kFailed;
  }
  return kDone;
}

}  // namespace

int provision(int argc, char** argv, int input_fd) {
  Arguments arguments;
  if (!parse_arguments(argc, argv, arguments)) {
    return kUsageError;
  }
  if (arguments.help) {
    fputs(kHelp, stdout);
    return kDone;
  }
  if (arguments.store.empty()) {
    arguments.store = android::base::GetProperty(kStorePathProperty, kDefaultStorePath);
  }
  return make_store(arguments, input_fd);
}

}  // namespace sentrova
