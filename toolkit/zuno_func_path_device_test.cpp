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
constexpr char kPolicyFile[] = "selinux_policy";  // beside this program
constexpr char kWorkFolder[] = "/label_test";

struct LabelFree {
  void operator()(char* label) const { freecon(label); }
};
struct HandleClose {
  void operator()(selabel_handle* handle) const { selabel_close(handle); }
};

// The label of `path`, "" if it has none.
std::string label_of(const std::string& path) {
  char* label = nullptr;
  const bool labelled = getfilecon(path.c_str(), &label) > 0;
  const std::unique_ptr<char, LabelFree> owner(label);
  return labelled ? label : "";
}

// The label with which this thread creates files, "" if that is left to the kernel.
std::string creation_context() {
  char* label = nullptr;
  EXPECT_EQ(getfscreatecon(&label), 0);
  const std::unique_ptr<char, LabelFree> owner(label);
  return label == nullptr ? "" : label;
}

// Loads the policy beside this program. Returns an empty text, or what the device lacks.
std::string load_policy() {
  if (access(kSelinuxFolder, F_OK) != 0) {
    return "the kernel was not started with security=selinux";
  }
  const std::string load_node = std::string(kSelinuxFolder) + "/load";
  if (access(load_node.c_str(), F_OK) != 0 &&
      mount("selinuxfs", kSelinuxFolder, "selinuxfs", 0, nullptr) != 0) {
    return "selinuxfs cannot be mounted";
  }
  std::string policy;
  if (!android::base::ReadFileToString(android::base::GetExecutableDirectory() + "/" + kPolicyFile,
                                       &policy)) {
    return "there is no policy beside the test";
  }
  return android::base::WriteStringToFile(policy, load_node) ? "" : "the kernel refuses the policy";
}

// Directories on a tmpfs, for which the policy gives the label "tmpfs".
class ZunoFuncLabels : public sentrova::toolkit::ScratchTest {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ROOT();
    static const std::string refusal = load_policy();
    if (refusal.starts_with("the kernel was not started")) {
      GTEST_SKIP() << refusal;
    }
    ASSERT_EQ(refusal, "");
    tmpfs_ = std::make_unique<sentrova::testing::ScopedTmpfs>(kWorkFolder);
    const std::string contexts =
        make_file("contexts", folder("labelled") + "(/.*)? u:object_r:test_data:s0\n");
    const selinux_opt option = {SELABEL_OPT_PATH, contexts.c_str()};
    labels_.reset(selabel_open(SELABEL_CTX_FILE, &option, 1));
    ASSERT_NE(labels_, nullptr);
  }

  static std::string folder(const std::string& name) {
    return std::string(kWorkFolder) + "/" + name;
  }

  std::unique_ptr<sentrova::testing::ScopedTmpfs> tmpfs_;
  std::unique_ptr<selabel_handle, HandleClose> labels_;
};

TEST_F(ZunoFuncLabels, StandOnTheNewDirectoriesOnly) {
  ASSERT_TRUE(ZunoFunc::Recursive_Mkdir(folder("labelled/a/b"), 0750, false, labels_.get()));
  for (const std::string name : {"labelled", "labelled/a", "labelled/a/b"}) {
    EXPECT_EQ(label_of(folder(name)), "u:object_r:test_data:s0") << name;
    EXPECT_EQ(mode_of(folder(name)), 0750U);
  }
  EXPECT_EQ(creation_context(), "");
  ASSERT_TRUE(ZunoFunc::Recursive_Mkdir(folder("after")));
  EXPECT_EQ(label_of(folder("after")), "u:object_r:tmpfs:s0");
}

TEST_F(ZunoFuncLabels, AreLeftToTheKernelWhereNoneIsKnown) {
  ASSERT_TRUE(ZunoFunc::Recursive_Mkdir(folder("plain"), 0755, false, labels_.get()));
  EXPECT_EQ(label_of(folder("plain")), "u:object_r:tmpfs:s0");
  ASSERT_TRUE(ZunoFunc::Recursive_Mkdir(folder("labelled"), 0755, false, nullptr));
  EXPECT_EQ(label_of(folder("labelled")), "u:object_r:tmpfs:s0");
}

TEST_F(ZunoFuncLabels, DoNotOutliveAFailure) {
  // A dangling link is absent to the look and in the way of mkdir.
  ASSERT_EQ(symlink("/no/such/target", folder("labelled").c_str()), 0);
  errno = 0;
  EXPECT_FALSE(ZunoFunc::Recursive_Mkdir(folder("labelled/x"), 0755, false, labels_.get()));
  EXPECT_EQ(errno, EEXIST);
  EXPECT_EQ(creation_context(), "");
}

}  // namespace
