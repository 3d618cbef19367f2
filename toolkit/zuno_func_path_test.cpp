#include <errno.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <selinux/label.h>
#include <selinux/selinux.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/un.h>
#include <unistd.h>

#include <functional>
#include <memory>

#include "tests/support/captured_stdout.h"
#include "tests/support/descriptor_limit.h"
#include "tests/support/private_mounts.h"
#include "toolkit/scratch_test.h"
#include "toolkit/zuno_func.h"

namespace fs = std::filesystem;

using sentrova::testing::CapturedStdout;
using sentrova::testing::DescriptorLimit;
using sentrova::toolkit::kAwkwardNames;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using testing::UnorderedElementsAre;
using testing::UnorderedElementsAreArray;

namespace {

// What the thread's creation context was set to, in order; "" for none. Stands in for the kernel,
// which has no labels here.
std::vector<std::string>& creation_contexts() {
  static std::vector<std::string> contexts;
  return contexts;
}

}  // namespace

// Fails as it does on a kernel without labels, and spoils errno.
int setfscreatecon(const char* context) {
  creation_contexts().push_back(context == nullptr ? "" : context);
  errno = EINVAL;
  return -1;
}

namespace {

class ZunoFuncPath : public sentrova::toolkit::ScratchTest {
 protected:
  void SetUp() override { creation_contexts().clear(); }

  std::string make_fifo(const std::string& name) const {
    EXPECT_EQ(mkfifo(path(name).c_str(), 0600), 0);
    return path(name);
  }
  std::string make_socket(const std::string& name) const {
    const android::base::unique_fd socket_fd(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    path(name).copy(address.sun_path, sizeof(address.sun_path) - 1);
    EXPECT_EQ(bind(socket_fd.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    return path(name);
  }
  // A path of exactly `length` bytes whose directories exist.
  std::string long_path(size_t length) const {
    std::string result = root();
    while (length - result.size() > 256) {
      result += "/" + std::string(length - result.size() > 400 ? 199 : 99, 'd');
      mkdir(result.c_str(), 0755);
    }
    return result + "/" + std::string(length - result.size() - 1, 'f');
  }
};

TEST(ZunoFuncPathText, TakesPathsApart) {
  struct Row {
    std::string path, filename, directory, parent, root;
  };
  const Row rows[] = {
      {"a/b/c", "c", "a/b/", "a/b", "/a"},
      {"a/b/", "", "a/b/", "a/b", "/a"},
      {"abc", "abc", "abc", "abc", "/abc"},
      {"/a", "a", "/", "", "/a"},
      {"/a/b", "b", "/a/", "/a", "/a"},
      {"", "", "", "", "/"},
      {"/", "", "/", "", "/"},
      {"x", "x", "x", "x", "/x"},
      {"//x", "x", "//", "/", "//x"},
      {"//x/y", "y", "//x/", "//x", "//x"},
      {"/system/bin/sh", "sh", "/system/bin/", "/system/bin", "/system"},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.path);
    EXPECT_EQ(ZunoFunc::Get_Filename(row.path), row.filename);
    EXPECT_EQ(ZunoFunc::get_file_name(row.path), row.filename);
    EXPECT_EQ(ZunoFunc::Get_Path(row.path), row.directory);
    EXPECT_EQ(ZunoFunc::get_file_parent(row.path), row.parent);
    EXPECT_EQ(ZunoFunc::Get_Root_Path(row.path), row.root);
  }
}

TEST(ZunoFuncPathText, CollapsesSlashes) {
  const std::pair<std::string, std::string> rows[] = {
      {"a//b///", "a/b"}, {"/", ""}, {"///", ""}, {"", ""}, {"//a", "/a"}, {"/a/b", "/a/b"}};
  for (const auto& [path, expected] : rows) {
    EXPECT_EQ(ZunoFunc::Remove_Trailing_Slashes(path, false), expected) << path;
    EXPECT_EQ(ZunoFunc::Remove_Trailing_Slashes(path, true), expected + "/") << path;
  }
}

TEST_F(ZunoFuncPath, TellsWhatExistsAndWhetherItIsADirectory) {
  const std::string file = make_file("f", "12345");
  fs::create_symlink(root(), path("link"));
  fs::create_symlink("loop", path("loop"));
  struct Row {
    std::string path, message;
    int directory_status, directory_error;
  };
  const Row rows[] = {{"", "The parameter is empty", 0, ENOENT},
                      {path("missing"), "No such file or directory", 0, ENOENT},
                      {file + "/below", "Not a directory", 2, ENOTDIR},
                      {path("loop"), "Too many levels of symbolic links", 2, ELOOP},
                      {file, "", 2, ENOTDIR},
                      {path("link"), "", 1, 0},
                      {root(), "", 1, 0}};
  for (const Row& row : rows) {
    SCOPED_TRACE(row.path);
    std::string error = "old";
    EXPECT_EQ(ZunoFunc::Path_Exists(row.path, error), row.message.empty());
    EXPECT_EQ(error, row.message);
    EXPECT_EQ(ZunoFunc::Path_Exists(row.path), row.message.empty());
    errno = 0;
    EXPECT_EQ(ZunoFunc::Dir_Status(row.path), row.directory_status);
    EXPECT_EQ(errno, row.directory_error);
  }
  EXPECT_EQ(ZunoFunc::Get_File_Size(file), 5U);
  EXPECT_EQ(ZunoFunc::Get_File_Size(path("missing")), 0U);
}

TEST_F(ZunoFuncPath, DerivesEntryTypesFromModeBits) {
  EXPECT_EQ(ZunoFunc::Get_D_Type_From_Stat(root()), 4);
  EXPECT_EQ(ZunoFunc::Get_D_Type_From_Stat(make_file("f", "")), 10);
  EXPECT_EQ(ZunoFunc::Get_D_Type_From_Stat(make_fifo("p")), 1);
  EXPECT_EQ(ZunoFunc::Get_D_Type_From_Stat(make_socket("s")), 4);
  EXPECT_EQ(ZunoFunc::Get_D_Type_From_Stat("/dev/null"), 6);
  EXPECT_EQ(ZunoFunc::Get_D_Type_From_Stat(path("missing")), 0);
  if (mknod(path("b").c_str(), S_IFBLK | 0600, makedev(7, 200)) == 0) {  // not everybody may
    EXPECT_EQ(ZunoFunc::Get_D_Type_From_Stat(path("b")), 4);
  }
}

TEST_F(ZunoFuncPath, TakesTheLongestPathThatTheKernelTakes) {
  const std::string longest = long_path(4095);
  EXPECT_FALSE(ZunoFunc::Path_Exists(longest));
  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir(longest));
  EXPECT_EQ(ZunoFunc::Dir_Status(longest), 1);
  EXPECT_EQ(ZunoFunc::Dir_Status(longest + "f"), 2);
  EXPECT_EQ(errno, ENAMETOOLONG);
  EXPECT_EQ(ZunoFunc::Remove_Dir(root(), true), 0);
  EXPECT_THAT(ZunoFunc::Files_In_Dir(root()), IsEmpty());
}

TEST_F(ZunoFuncPath, MakesChainsFromTheRoot) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir("relative/chain"));
  EXPECT_EQ(ZunoFunc::Dir_Status("/relative/chain"), 1);
  EXPECT_TRUE(ZunoFunc::Create_Dir_Recursive("made/of//parts/", 0750, getuid(), getgid()));
  EXPECT_EQ(mode_of("/made/of/parts"), 0750U);
  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir(""));
}

TEST_F(ZunoFuncPath, SaysWhichDirectoryItCannotMake) {
  const std::string file = make_file("f", "");
  CapturedStdout output;
  EXPECT_FALSE(ZunoFunc::Recursive_Mkdir(path("new/../f/x/y")));
  EXPECT_EQ(errno, ENOTDIR);
  EXPECT_EQ(output.take(), "[ZunoFunc]E: create_folder_strerr=Can not create " +
                               path("new/../f/x") + " folder (Not a directory)\n");
  EXPECT_TRUE(exists(path("new")));
}

TEST_F(ZunoFuncPath, CreatesWithModeAndOwnerWhateverTheUmask) {
  make_directory("old");
  chmod(path("old").c_str(), 0700);
  const mode_t umask_before = umask(0077);
  EXPECT_TRUE(ZunoFunc::Create_Dir_Recursive(path("old/x/y"), 0775, getuid(), getgid()));
  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir(path("masked"), 0777, false, nullptr));
  umask(umask_before);
  EXPECT_EQ(mode_of(path("old")), 0700U);
  EXPECT_EQ(mode_of(path("old/x")), 0775U);
  EXPECT_EQ(mode_of(path("old/x/y")), 0775U);
  EXPECT_EQ(mode_of(path("masked")), 0700U);
  make_file("f", "");
  CapturedStdout output;
  EXPECT_FALSE(ZunoFunc::Create_Dir_Recursive(path("f/z"), 0755, getuid(), getgid()));
  EXPECT_EQ(errno, EEXIST);
  EXPECT_EQ(output.take(), "");
}

TEST_F(ZunoFuncPath, MakesParentsOrWholeChains) {
  make_file("f", "");
  struct Row {
    std::string path;
    bool parent_only;
    int error;  // 0: succeeds
    std::string made;
  };
  const Row rows[] = {
      {"", false, ENOENT, ""},
      {"", true, ENOENT, ""},
      {"bare", true, ENOENT, ""},
      {"/", true, 0, ""},
      {path("p/q/file"), true, 0, path("p/q")},
      {path("p//r///s/"), false, 0, path("p/r/s")},
      {path("p/q"), false, 0, path("p/q")},
      {path("f"), false, ENOTDIR, ""},
      {path("f/x"), false, ENOTDIR, ""},
      {path(std::string(256, 'n') + "/x"), false, ENAMETOOLONG, ""},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.path);
    errno = 0;
    EXPECT_EQ(ZunoFunc::Recursive_Mkdir(row.path, 0755, row.parent_only, nullptr), row.error == 0);
    if (row.error != 0) {
      EXPECT_EQ(errno, row.error);
    }
    EXPECT_TRUE(row.made.empty() || ZunoFunc::Dir_Status(row.made) == 1);
  }
  EXPECT_FALSE(exists(path("p/q/file")));
}

struct LabelsCloser {
  void operator()(selabel_handle* handle) const { selabel_close(handle); }
};

TEST_F(ZunoFuncPath, LabelsOnlyWhatItMakesAndResets) {
  const std::string contexts = make_file(
      "contexts", make_directory("top") + "(/.*)? u:object_r:outer:s0\n" + path("top/plain") +
                      " <<none>>\n" + path("top/bad/x") + " u:object_r:inner:s0\n");
  const selinux_opt option = {SELABEL_OPT_PATH, contexts.c_str()};
  const std::unique_ptr<selabel_handle, LabelsCloser> labels(
      selabel_open(SELABEL_CTX_FILE, &option, 1));
  ASSERT_NE(labels, nullptr);

  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir(path("top/a/b"), 0751, false, labels.get()));
  EXPECT_EQ(mode_of(path("top/a/b")), 0751U);
  EXPECT_THAT(creation_contexts(),
              ElementsAre("u:object_r:outer:s0", "", "u:object_r:outer:s0", ""));

  creation_contexts().clear();
  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir(path("top/plain"), 0755, false, labels.get()));
  EXPECT_THAT(creation_contexts(), ElementsAre("", ""));

  // A dangling link is absent to the look and in the way of mkdir.
  fs::create_symlink(path("nowhere"), path("top/bad"));
  creation_contexts().clear();
  errno = 0;
  EXPECT_FALSE(ZunoFunc::Recursive_Mkdir(path("top/bad/x"), 0755, false, labels.get()));
  EXPECT_EQ(errno, EEXIST);
  EXPECT_THAT(creation_contexts(), ElementsAre("u:object_r:outer:s0", ""));
}

TEST_F(ZunoFuncPath, RemovesTreesWithoutFollowingLinks) {
  const std::string outside = make_file("outside/kept", "x");
  const std::string tree = make_directory("tree");
  make_file("tree/.hidden/f", "");
  make_fifo("tree/p");
  make_socket("tree/s");
  for (const std::string& name : kAwkwardNames) {
    make_file("tree/d/" + name, "");
  }
  fs::create_directory_symlink(path("outside"), path("tree/link"));
  EXPECT_EQ(ZunoFunc::Remove_Dir(tree, true), 0);
  EXPECT_TRUE(fs::is_empty(tree));
  EXPECT_EQ(ZunoFunc::Remove_Dir(tree, false), 0);
  EXPECT_FALSE(exists(tree));
  EXPECT_EQ(content_of(outside), "x");
}

TEST_F(ZunoFuncPath, LeavesDeviceNodesInPlace) {
  const std::string tree = make_directory("tree");
  if (mknod(path("tree/c").c_str(), S_IFCHR | 0600, makedev(1, 3)) != 0) {
    GTEST_SKIP() << "this process may not make device nodes";
  }
  make_file("tree/f", "");
  EXPECT_EQ(ZunoFunc::Remove_Dir(tree, true), 0);
  EXPECT_FALSE(exists(path("tree/f")));
  EXPECT_TRUE(exists(path("tree/c")));
  EXPECT_EQ(ZunoFunc::Remove_Dir(tree, false), -1);
  EXPECT_EQ(errno, ENOTEMPTY);
  EXPECT_EQ(ZunoFunc::Remove_Dir(root(), true), -1);
}

TEST_F(ZunoFuncPath, SaysWhatItCannotRemove) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  const std::string pinned = make_file("tree/d/pinned", "");
  ASSERT_EQ(mount("/proc/version", pinned.c_str(), nullptr, MS_BIND, nullptr), 0);
  CapturedStdout output;
  EXPECT_EQ(ZunoFunc::Remove_Dir(path("tree"), false), -1);
  EXPECT_EQ(errno, EBUSY);
  EXPECT_EQ(ZunoFunc::Remove_Dir(path("missing"), false), -1);
  EXPECT_EQ(errno, ENOENT);
  EXPECT_EQ(output.take(),
            "[ZunoFunc]I: Unable to unlink '" + pinned + ": Device or resource busy'\n" +
                "[ZunoFunc]E: rror_opening_strerr=Error opening: " + path("missing") +
                " No such file or directory\n");
  EXPECT_EQ(umount(pinned.c_str()), 0);
}

TEST_F(ZunoFuncPath, RemovesDeepTreesWithFewDescriptors) {
  make_file("deep/" + deep_path(200) + "/f", "");
  const DescriptorLimit few(4);
  EXPECT_EQ(ZunoFunc::Remove_Dir(path("deep"), false), 0);
  EXPECT_FALSE(exists(path("deep")));
}

TEST_F(ZunoFuncPath, RemovesSingleFiles) {
  const std::string file = make_file("f", "");
  fs::create_symlink("nowhere", path("dangling"));
  EXPECT_EQ(ZunoFunc::Remove_File(""), -2);
  EXPECT_EQ(ZunoFunc::Remove_File(file), 0);
  EXPECT_FALSE(exists(file));
  EXPECT_EQ(ZunoFunc::Remove_File(file), 0);
  EXPECT_EQ(ZunoFunc::Remove_File(path("dangling")), 0);
  EXPECT_TRUE(exists(path("dangling")));
  EXPECT_EQ(ZunoFunc::Remove_File(root()), -1);
  EXPECT_EQ(errno, EISDIR);
}

TEST_F(ZunoFuncPath, ListsWhatItCanLookAt) {
  const std::string directory = make_directory("d");
  std::vector<std::string> expected = {make_directory("d/.sub")};
  for (const std::string& name : kAwkwardNames) {
    expected.push_back(make_file("d/" + name, ""));
  }
  fs::create_symlink("nowhere", path("d/gone"));
  CapturedStdout output;
  EXPECT_THAT(ZunoFunc::Files_In_Dir(directory), UnorderedElementsAreArray(expected));
  EXPECT_THAT(ZunoFunc::Files_In_Dir(path("missing")), IsEmpty());
  EXPECT_THAT(ZunoFunc::Files_In_Dir(expected[1]), IsEmpty());
  EXPECT_EQ(output.take(),
            "[ZunoFunc]I: Failed to stat " + path("d/gone") + " (No such file or directory)\n" +
                "[ZunoFunc]I: Failed to opendir " + expected[1] + " (Not a directory)\n");
}

TEST_F(ZunoFuncPath, MatchesBareNames) {
  const std::string file = make_file("d/keep1", "");
  make_file("d/drop", "");
  make_directory("d/keep2");
  std::vector<std::string> names = {"before"};
  const auto begins_with_keep = [](const std::string& name) { return name.starts_with("keep"); };
  EXPECT_TRUE(ZunoFunc::GetMatchFileFromDir(path("d"), names, begins_with_keep));
  EXPECT_THAT(names, UnorderedElementsAre("before", "keep1", "keep2"));
  EXPECT_EQ(names.front(), "before");

  CapturedStdout output;
  EXPECT_FALSE(ZunoFunc::GetMatchFileFromDir("", names, begins_with_keep));
  EXPECT_FALSE(ZunoFunc::GetMatchFileFromDir(path("missing"), names, begins_with_keep));
  EXPECT_FALSE(ZunoFunc::GetMatchFileFromDir(file, names, begins_with_keep));
  EXPECT_EQ(output.take(), "[ZunoFunc]E: Failed to opendir:" + file + " (Not a directory)\n");
  EXPECT_EQ(names.size(), 3U);

  EXPECT_THROW(ZunoFunc::GetMatchFileFromDir(path("d"), names, nullptr), std::bad_function_call);
  EXPECT_TRUE(ZunoFunc::GetMatchFileFromDir(make_directory("empty"), names, nullptr));

  // Of two entries, each of which deletes the other, one is there to be looked at.
  make_file("pair/one", "");
  make_file("pair/two", "");
  names.clear();
  const auto delete_the_other = [this](const std::string& name) {
    return unlink(path(name == "one" ? "pair/two" : "pair/one").c_str()) == 0;
  };
  EXPECT_TRUE(ZunoFunc::GetMatchFileFromDir(path("pair"), names, delete_the_other));
  EXPECT_THAT(names, SizeIs(1));
}

TEST_F(ZunoFuncPath, WalksLargeDirectories) {
#ifdef __aarch64__
  constexpr size_t kEntries = 20'000;  // the device may be emulated, on which more take a minute
#else
  constexpr size_t kEntries = 100'000;
#endif
  make_directory("d");
  for (size_t i = 0; i < kEntries; ++i) {
    ASSERT_EQ(mknod(path("d/" + std::to_string(i)).c_str(), S_IFREG | 0600, 0), 0);
  }
  EXPECT_EQ(ZunoFunc::Files_In_Dir(path("d")).size(), kEntries);
  std::vector<std::string> names;
  ZunoFunc::GetMatchFileFromDir(path("d"), names, [](const std::string&) { return true; });
  EXPECT_EQ(names.size(), kEntries);
  EXPECT_EQ(ZunoFunc::Remove_Dir(path("d"), false), 0);
  EXPECT_FALSE(exists(path("d")));
}

}  // namespace
