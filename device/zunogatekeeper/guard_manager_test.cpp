#include <android-base/file.h>
#include <android-base/properties.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zunogatekeeper.h>

#include <algorithm>
#include <functional>
#include <new>
#include <numeric>

#include "device/zunogatekeeper/credential_store.h"
#include "device/zunogatekeeper/sqlite_handles.h"

namespace sentrova {
namespace {

// Room filled with one byte value, and the manager built in it.
class ManagerInRoom {
 public:
  explicit ManagerInRoom(int user_id, int fill = 0) {
    memset(room_, fill, sizeof(room_));
    manager_ = new (room_) ZunoGuardManager(user_id);
  }
  ~ManagerInRoom() { manager_->~ZunoGuardManager(); }
  ManagerInRoom(const ManagerInRoom&) = delete;
  ManagerInRoom& operator=(const ManagerInRoom&) = delete;
  ZunoGuardManager* operator->() { return manager_; }

 private:
  alignas(ZunoGuardManager) unsigned char room_[sizeof(ZunoGuardManager)];
  ZunoGuardManager* manager_;
};

Credential cheap_credential(int status, std::string_view password) {
  Credential credential = {.status = status, .cost = {.log2_n = 4, .r = 8, .p = 1}};
  credential.salt = random_salt().value();
  credential.digest = derive_digest(password, credential.salt, credential.cost).value();
  return credential;
}

class GuardManager : public testing::Test {
 protected:
  void SetUp() override {
    setenv("ANDROID_PROPERTY_DIR", properties_.path, 1);
    ASSERT_TRUE(android::base::SetProperty(kStorePathProperty, store_));
  }
  void TearDown() override { unsetenv("ANDROID_PROPERTY_DIR"); }

  void put(int user_id, const Credential& credential) {
    std::string error;
    ASSERT_TRUE(replace_store(store_, user_id, credential, error)) << error;
  }

  // Changes a store that was sound.
  void run_sql(const char* sql) {
    int code = SQLITE_OK;
    const Connection connection = open_database(store_.c_str(), SQLITE_OPEN_READWRITE, code);
    ASSERT_TRUE(connection);
    ASSERT_EQ(SQLITE_OK, sqlite3_exec(connection.get(), sql, nullptr, nullptr, nullptr))
        << sql << ": " << sqlite3_errmsg(connection.get());
  }

  // The store must not be believed, and one line each must say so.
  void expect_refused(const std::string& what) {
    ManagerInRoom manager(0);
    sqlite3_memory_highwater(1);
    testing::internal::CaptureStderr();
    EXPECT_EQ(-1, manager->getLockStatus()) << what;
    EXPECT_FALSE(manager->verifyPassword("1234")) << what;
    const std::string said = testing::internal::GetCapturedStderr();
    EXPECT_EQ(2, std::count(said.begin(), said.end(), '\n')) << what << ": " << said;
    EXPECT_NE(std::string::npos, said.find(store_)) << said;
    EXPECT_EQ(std::string::npos, said.find("1234")) << said;
    EXPECT_LT(sqlite3_memory_highwater(0), 1 << 20) << what;
  }

  TemporaryDir properties_;
  TemporaryDir folder_;
  const std::string store_ = folder_.path + std::string("/credentials.db");
};

TEST_F(GuardManager, ReportsEveryStatusAndMatchesOnlyTheRightPassword) {
  for (int status = 1; status <= kHighestStatus; ++status) {
    put(0, cheap_credential(status, "1234"));
    ManagerInRoom manager(0);
    EXPECT_EQ(status, manager->getLockStatus());
    EXPECT_TRUE(manager->verifyPassword("1234"));
    for (const std::string& wrong :
         {std::string(), std::string("123"), std::string("12345"), std::string("1234\0", 5),
          std::string("~"), std::string(1 << 20, '1')}) {
      EXPECT_FALSE(manager->verifyPassword(wrong)) << wrong.substr(0, 10);
    }
  }
  put(0, Credential{});
  ManagerInRoom open(0);
  EXPECT_EQ(0, open->getLockStatus());
  EXPECT_FALSE(open->verifyPassword(""));

  put(10, cheap_credential(3, "ten"));
  ManagerInRoom ten(10, 0xa5);
  EXPECT_EQ(3, ten->getLockStatus());
  EXPECT_TRUE(ten->verifyPassword("ten"));
  expect_refused("another user's store");
}

TEST_F(GuardManager, RefusesWhatIsNoStore) {
  put(0, cheap_credential(2, "1234"));
  std::string sound;
  ASSERT_TRUE(android::base::ReadFileToString(store_, &sound));
  const auto write = [&](const std::string& content) {
    ASSERT_TRUE(android::base::WriteStringToFile(content, store_));
  };
  const std::pair<const char*, std::function<void()>> cases[] = {
      {"absent", [] {}},
      {"empty file", [&] { write(""); }},
      {"cut in the middle", [&] { write(sound.substr(0, sound.size() / 2)); }},
      {"damaged page header", [&] { write(sound.substr(0, 100) + std::string(4000, '\xff')); }},
      {"FIFO", [&] { mkfifo(store_.c_str(), 0600); }},
      {"dangling link", [&] { EXPECT_EQ(0, symlink("nowhere", store_.c_str())); }},
  };
  for (const auto& [what, make] : cases) {
    remove(store_.c_str());
    make();
    expect_refused(what);
  }
}

// A view in the table's place whose rows never end and never reach user 0.
constexpr char kEndlessView[] =
    "DROP TABLE credential; CREATE VIEW credential AS"
    " WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n)"
    " SELECT i AS user_id, 0 AS status, 1 AS log2_n, 1 AS r, 1 AS p, 0 AS salt, 0 AS digest"
    " FROM n";

// A table without column types holds text where a number belongs.
constexpr char kTextStatus[] =
    "CREATE TABLE other AS SELECT * FROM credential; DROP TABLE credential;"
    " ALTER TABLE other RENAME TO credential; UPDATE credential SET status = 'two'";

TEST_F(GuardManager, RefusesDamagedRowsAndAbsurdCosts) {
  const char* const damages[] = {
      "PRAGMA user_version = 2",
      "PRAGMA application_id = 1",
      "DELETE FROM credential",
      "ALTER TABLE credential DROP COLUMN salt",
      "UPDATE credential SET status = 6",
      "UPDATE credential SET status = 4294967297",
      "UPDATE credential SET log2_n = 9223372036854775807",
      "UPDATE credential SET log2_n = 20, r = 32",
      "UPDATE credential SET r = 1099511627776",
      "UPDATE credential SET p = 0",
      "UPDATE credential SET salt = zeroblob(31)",
      "UPDATE credential SET salt = zeroblob(50000000)",
      "UPDATE credential SET digest = zeroblob(33)",
      kEndlessView,
      kTextStatus,
  };
  for (const char* damage : damages) {
    put(0, cheap_credential(2, "1234"));
    run_sql(damage);
    expect_refused(damage);
  }
}

// The value comes from a straightforward transcription of RFC 7914, checked against its vectors.
TEST(CredentialDigest, IsScryptWithItsParametersInTheirPlaces) {
  Salt salt = {};
  std::iota(salt.begin(), salt.end(), uint8_t{0});
  const Digest expected = {0x2c, 0x84, 0x89, 0x2b, 0xee, 0x58, 0xb2, 0x91, 0xcd, 0xa1, 0x56,
                           0x3e, 0xa7, 0xb2, 0xa1, 0xf9, 0xe8, 0x78, 0xb2, 0x32, 0x1c, 0xf5,
                           0xb2, 0x17, 0xff, 0xd9, 0xea, 0xcc, 0x34, 0x47, 0xda, 0x72};
  EXPECT_EQ(expected, derive_digest("1234", salt, {.log2_n = 4, .r = 8, .p = 2}));
  EXPECT_FALSE(is_acceptable_cost({.log2_n = 17, .r = 8, .p = 1}));
  EXPECT_TRUE(is_acceptable_cost({.log2_n = 14, .r = 32, .p = 4}));
  EXPECT_TRUE(derive_digest("1234", {}, {.log2_n = 14, .r = 32, .p = 1}))
      << "memory for the largest";
}

}  // namespace
}  // namespace sentrova
