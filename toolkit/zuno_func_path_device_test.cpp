#include <android-base/file.h>
#include <gtest/gtest.h>
#include <selinux/label.h>
#include <selinux/selinux.h>
#include <sys/mount.h>
#include <unistd.h>

#include <memory>

#include "tests/support/private_mounts.h"
#include "toolkit/scratch_test.h"
#include "toolkit/zuno_func.h"

namespace {

constexpr char kSelinuxFolder[] = "/sys/fs/selinux";
constexpr char kLoadNode[] = "/sys/fs/selinux/load";
constexpr char kTop[] = "/label_test";

using Label = std::unique_ptr<char, decltype(&freecon)>;

// The label of `path`, "" if it has none.
std::string label_of(const std::string& path) {
  char* label = nullptr;
  getfilecon(path.c_str(), &label);
  return label == nullptr ? "" : Label(label, freecon).get();
}

// The label with which this thread creates files, "" if that is left to the kernel.
std::string creation_context() {
  char* label = nullptr;
  EXPECT_EQ(getfscreatecon(&label), 0);
  return label == nullptr ? "" : Label(label, freecon).get();
}

using ZunoFuncLabels = sentrova::toolkit::ScratchTest;

// On a tmpfs, for which the policy beside this program has the label "tmpfs".
TEST_F(ZunoFuncLabels, StandOnNewDirectoriesOnlyAndDoNotOutliveTheCall) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  if (access(kSelinuxFolder, F_OK) != 0) {
    GTEST_SKIP() << "the kernel was not started with security=selinux";
  }
  ASSERT_TRUE(access(kLoadNode, F_OK) == 0 ||
              mount("selinuxfs", kSelinuxFolder, "selinuxfs", 0, nullptr) == 0);
  ASSERT_TRUE(android::base::WriteStringToFile(
      content_of(android::base::GetExecutableDirectory() + "/selinux_policy"), kLoadNode));
  const sentrova::testing::ScopedTmpfs tmpfs(kTop);
  const std::string top = kTop;
  const std::string contexts =
      make_file("contexts", top + "/(data|bad)(/.*)? u:object_r:test_data:s0\n");
  const selinux_opt option = {SELABEL_OPT_PATH, contexts.c_str()};
  const std::unique_ptr<selabel_handle, decltype(&selabel_close)> labels(
      selabel_open(SELABEL_CTX_FILE, &option, 1), selabel_close);
  ASSERT_NE(labels, nullptr);

  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir(top + "/data", 0755, false, nullptr));
  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir(top + "/data/a/b", 0750, false, labels.get()));
  EXPECT_EQ(label_of(top + "/data"), "u:object_r:tmpfs:s0");
  for (const std::string made : {"/data/a", "/data/a/b"}) {
    EXPECT_EQ(label_of(top + made), "u:object_r:test_data:s0") << made;
    EXPECT_EQ(mode_of(top + made), 0750U);
  }
  EXPECT_EQ(creation_context(), "");
  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir(top + "/plain", 0755, false, labels.get()));
  EXPECT_EQ(label_of(top + "/plain"), "u:object_r:tmpfs:s0");

  // A dangling link is absent to the look and in the way of mkdir.
  ASSERT_EQ(symlink("/no/such/target", (top + "/bad").c_str()), 0);
  EXPECT_FALSE(ZunoFunc::Recursive_Mkdir(top + "/bad/x", 0755, false, labels.get()));
  EXPECT_EQ(errno, EEXIST);
  EXPECT_EQ(creation_context(), "");
}

}  // namespace
