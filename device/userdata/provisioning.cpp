#include "device/userdata/provisioning.h"

#include <android-base/file.h>
#include <android-base/scopeguard.h>
#include <string.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <system_error>
#include <vector>

#include "device/userdata/file_system.h"
#include "device/userdata/lock.h"
#include "device/userdata/sample_files.h"
#include "device/zuno_vold/crypto_footer.h"
#include "device/zunofscrypt/crypt_mapping.h"
#include "device/zunofscrypt/encryption_policy.h"
#include "device/zunofscrypt/key_file.h"
#include "device/zunofscrypt/wrapped_key.h"

namespace sentrova {
namespace {

constexpr char kMetadataKeyFolder[] = "/vold/metadata_encryption";

struct KindRow {
  UserDataKind kind;
  std::string_view name;
  // The fs_mgr options of its row in the fstab; the first kind has its key's folder besides.
  std::string_view options;
};

constexpr KindRow kKinds[] = {
    {UserDataKind::kFileEncryptedWithMetadata, "fbe-metadata",
     "wait,fileencryption=aes-256-xts:aes-256-cts:v2,keydirectory="},
    {UserDataKind::kFileEncrypted, "fbe", "wait,fileencryption=aes-256-xts:aes-256-cts:v2"},
    {UserDataKind::kFullDiskEncrypted, "fde", "wait,encryptable=footer"},
    {UserDataKind::kPlain, "plain", "wait"},
};

bool is_file_encrypted(UserDataKind kind) {
  return kind == UserDataKind::kFileEncryptedWithMetadata || kind == UserDataKind::kFileEncrypted;
}

// Makes user data step by step; every step returns false with the reason in error_.
class Provisioning {
 public:
  Provisioning(const Places& places, const UserDataRequest& request, std::string& error)
      : places_(places), request_(request), error_(error) {}

  bool run(std::string_view secret) {
    if (!no_mapping_is_there() || !provide_device_secret()) {
      return false;
    }
    const auto clean_up = android::base::make_scope_guard([this] {
      std::string ignored;
      close_user_data(places_, ignored);
    });
    return open_device() && make_file_system(request_.file_system, device_, error_) &&
           mount_device() && fill(secret) && close_user_data(places_, error_);
  }

 private:
  bool no_mapping_is_there() {
    const std::optional<std::string> node = find_mapping(places_.mapping, error_);
    if (node && !node->empty()) {
      error_ = "the user data is unlocked: " + *node;
    }
    return node && node->empty();
  }

  bool provide_device_secret() {
    if (access(places_.device_secret().c_str(), F_OK) == 0) {
      return true;
    }
    WrappingKey secret;
    return random_key(secret) &&
           replace_file(places_.device_secret(), secret.data(), WrappingKey::size(), error_);
  }

  template <typename Key>
  bool random_key(Key& key) {
    const bool filled = fill_randomly(key.data(), Key::size());
    if (!filled) {
      error_ = "the random source fails";
    }
    return filled;
  }

  // The device that the file system goes on: the partition or a dm-crypt device over it.
  bool open_device() {
    if (request_.kind == UserDataKind::kFileEncryptedWithMetadata) {
      return map_with_metadata_key();
    }
    if (request_.kind == UserDataKind::kFullDiskEncrypted) {
      return map_with_footer();
    }
    device_ = request_.block_device;
    return true;
  }

  bool map_with_metadata_key() {
    const std::string folder = places_.metadata + kMetadataKeyFolder;
    MasterKey key;
    return random_key(key) && make_folder(folder) &&
           store_with_device_secret(key, kMetadataPurpose, folder + "/key") && map(key, 0);
  }

  bool map_with_footer() {
    MasterKey key;
    if (!random_key(key)) {
      return false;
    }
    const std::optional<WrappedKey> wrapped =
        checked(wrap_with_credential(key, kAbsentCredential, kFullDiskPurpose));
    return wrapped && write_footer(request_.block_device, *wrapped, error_) &&
           map(key, kFooterBytes);
  }

  bool map(const MasterKey& key, uint64_t reserved_bytes) {
    const std::optional<std::string> node =
        make_mapping(places_.mapping, request_.block_device, reserved_bytes, key, error_);
    device_ = node.value_or("");
    return node.has_value();
  }

  std::optional<WrappedKey> checked(std::optional<WrappedKey> wrapped) {
    if (!wrapped) {
      error_ = "a key cannot be wrapped";
    }
    return wrapped;
  }

  bool store_with_device_secret(const MasterKey& key, std::string_view purpose,
                                const std::string& path) {
    const std::optional<WrappingKey> secret = read_secret_file(places_.device_secret(), error_);
    const std::optional<WrappedKey> wrapped =
        secret ? checked(wrap_with_device_secret(key, *secret, purpose)) : std::nullopt;
    return wrapped && replace_file(path, wrapped->data(), wrapped->size(), error_);
  }

  bool mount_device() {
    if (mount(device_.c_str(), places_.data.c_str(), request_.file_system.c_str(), MS_NOATIME,
              "") != 0) {
      error_ = "cannot mount " + device_ + ": " + strerror(errno);
      return false;
    }
    return true;
  }

  bool fill(std::string_view secret) {
    return (is_file_encrypted(request_.kind)
                ? make_encrypted_storage(secret)
                : make_folders(places_.de_folders()) && make_folders(places_.ce_folders(0))) &&
           write_sample_files(places_, request_.digest_file, error_);
  }

  bool make_encrypted_storage(std::string_view secret) {
    static constexpr char kVersion[] = "1\n";
    MasterKey de_key;
    MasterKey ce_key;
    if (!make_folder(android::base::Dirname(places_.de_key())) || !random_key(de_key) ||
        !random_key(ce_key) || !store_with_device_secret(de_key, kDePurpose, places_.de_key()) ||
        !replace_file(places_.key_version(), kVersion, strlen(kVersion), error_) ||
        !encrypt_folders(places_.de_folders(), de_key)) {
      return false;
    }
    const std::optional<WrappedKey> wrapped =
        checked(wrap_with_credential(ce_key, secret, ce_purpose(0)));
    return wrapped && replace_file(places_.ce_key(0), wrapped->data(), wrapped->size(), error_) &&
           encrypt_folders(places_.ce_folders(0), ce_key);
  }

  bool encrypt_folders(const std::vector<std::string>& folders, const MasterKey& key) {
    const std::optional<KeyIdentifier> identifier = add_key(places_.data, key, error_);
    bool done = identifier && make_folders(folders);
    for (const std::string& folder : folders) {
      done = done && set_policy(folder, *identifier, error_);
    }
    return done;
  }

  bool make_folders(const std::vector<std::string>& folders) {
    bool done = true;
    for (const std::string& folder : folders) {
      done = done && make_folder(folder);
    }
    return done;
  }

  bool make_folder(const std::string& path) {
    std::error_code code;
    std::filesystem::create_directories(path, code);
    if (code) {
      error_ = path + ": " + code.message();
    }
    return !code;
  }

  const Places& places_;
  const UserDataRequest& request_;
  std::string& error_;
  std::string device_;
};

}  // namespace

std::optional<UserDataKind> parse_kind(std::string_view name) {
  for (const KindRow& row : kKinds) {
    if (row.name == name) {
      return row.kind;
    }
  }
  return std::nullopt;
}

std::string fstab_text(const Places& places, const UserDataRequest& request) {
  std::string text = "/dev/block/by-name/metadata " + places.metadata +
                     " ext4 noatime wait,first_stage_mount\n" + request.block_device + " " +
                     places.data + " " + request.file_system + " noatime ";
  for (const KindRow& row : kKinds) {
    if (row.kind == request.kind) {
      text += row.options;
    }
  }
  if (request.kind == UserDataKind::kFileEncryptedWithMetadata) {
    text += places.metadata + kMetadataKeyFolder;
  }
  return text + "\n";
}

bool provision_user_data(const Places& places, const UserDataRequest& request,
                         std::string_view secret, std::string& error) {
  return Provisioning(places, request, error).run(secret);
}

}  // namespace sentrova
