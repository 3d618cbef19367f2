#include <errno.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include "tests/support/captured_stdout.h"
#include "tests/support/descriptors.h"
#include "tests/support/private_mounts.h"
#include "toolkit/scratch_test.h"
#include "toolkit/zuno_func.h"

namespace fs = std::filesystem;

using sentrova::testing::CapturedStdout;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using testing::UnorderedElementsAre;

namespace {

class ZunoFuncPath : public sentrova::toolkit::ScratchTest {
 protected:
  std::string make_node(const std::string& name, mode_t type, dev_t device = 0) const {
    return mknod(path(name).c_str(), type | 0600, device) == 0 ? path(name) : "";
  }
};

TEST_F(ZunoFuncPath, TakesPathsApart) {
  struct Row {
    std::string path, filename, directory, parent, root, collapsed;
  };
  const Row rows[] = {
      {"a/b/c", "c", "a/b/", "a/b", "/a", "a/b/c"},
      {"a//b///", "", "a//b///", "a//b//", "/a", "a/b"},
      {"abc", "abc", "abc", "abc", "/abc", "abc"},
      {"/a", "a", "/", "", "/a", "/a"},
      {"", "", "", "", "/", ""},
      {"/", "", "/", "", "/", ""},
      {"//x", "x", "//", "/", "//x", "/x"},
      {"//x/y", "y", "//x/", "//x", "//x", "/x/y"},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.path);
    EXPECT_EQ(ZunoFunc::Get_Filename(row.path), row.filename);
    EXPECT_EQ(ZunoFunc::get_file_name(row.path), row.filename);
    EXPECT_EQ(ZunoFunc::Get_Path(row.path), row.directory);
    EXPECT_EQ(ZunoFunc::get_file_parent(row.path), row.parent);
    EXPECT_EQ(ZunoFunc::Get_Root_Path(row.path), row.root);
    EXPECT_EQ(ZunoFunc::Remove_Trailing_Slashes(row.path, false), row.collapsed);
    EXPECT_EQ(ZunoFunc::Remove_Trailing_Slashes(row.path, true), row.collapsed + "/");
  }
}

TEST_F(ZunoFuncPath, TellsWhatAPathIs) {
  const std::string file = make_file("f", "12345");
  fs::create_symlink(root(), path("link"));
  fs::create_symlink("loop", path("loop"));
  struct Row {
    std::string path, message;
    int directory_status, directory_error, entry_type;
  };
  const Row rows[] = {{"", "The parameter is empty", 0, ENOENT, 0},
                      {path("missing"), "No such file or directory", 0, ENOENT, 0},
                      {file + "/below", "Not a directory", 2, ENOTDIR, 0},
                      {path("loop"), "Too many levels of symbolic links", 2, ELOOP, 0},
                      {file, "", 2, ENOTDIR, 10},
                      {make_node("fifo", S_IFIFO), "", 2, ENOTDIR, 1},
                      {make_node("socket", S_IFSOCK), "", 2, ENOTDIR, 4},
                      {"/dev/null", "", 2, ENOTDIR, 6},
                      {path("link"), "", 1, 0, 4}};
  for (const Row& row : rows) {
    SCOPED_TRACE(row.path);
    std::string error = "old";
    EXPECT_EQ(ZunoFunc::Path_Exists(row.path, error), row.message.empty());
    EXPECT_EQ(error, row.message);
    EXPECT_EQ(ZunoFunc::Path_Exists(row.path), row.message.empty());
    errno = 0;
    EXPECT_EQ(ZunoFunc::Dir_Status(row.path), row.directory_status);
    EXPECT_EQ(errno, row.directory_error);
    EXPECT_EQ(ZunoFunc::Get_D_Type_From_Stat(row.path), row.entry_type);
  }
  EXPECT_EQ(ZunoFunc::Get_File_Size(file), 5U);
  EXPECT_EQ(ZunoFunc::Get_File_Size(path("missing")), 0U);
}

TEST_F(ZunoFuncPath, MakesChainsFromTheRoot) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  make_directory("old");
  chmod(path("old").c_str(), 0700);
  const uid_t owner = chown(make_file("f").c_str(), 1000, 1000) == 0 ? 1000 : 0;  // who may
  const mode_t umask_before = umask(0077);
  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir("relative//chain/"));
  EXPECT_TRUE(ZunoFunc::Recursive_Mkdir(""));
  EXPECT_TRUE(ZunoFunc::Create_Dir_Recursive("made/of//parts/", 0775, owner, getgid()));
  EXPECT_TRUE(ZunoFunc::Create_Dir_Recursive(path("old/x"), 0775, getuid(), owner));
  umask(umask_before);
  EXPECT_EQ(mode_of("/relative/chain"), 0700U);
  EXPECT_EQ(mode_of("/made"), 0775U);
  EXPECT_EQ(status_of("/made/of/parts").st_uid, owner);
  EXPECT_EQ(status_of(path("old/x")).st_gid, owner);
  EXPECT_EQ(mode_of(path("old")), 0700U);

  CapturedStdout output;
  EXPECT_FALSE(ZunoFunc::Create_Dir_Recursive(path("f/z"), 0755, getuid(), getgid()));
  EXPECT_EQ(errno, EEXIST);
  EXPECT_FALSE(ZunoFunc::Recursive_Mkdir(path("new/../f/x/y")));
  EXPECT_EQ(errno, ENOTDIR);
  EXPECT_EQ(output.take(), "[ZunoFunc]E: create_folder_strerr=Can not create " +
                               path("new/../f/x") + " folder (Not a directory)\n");
  EXPECT_THAT(tree_of(root()), ElementsAre("f=", "new/", "old/", "old/x/"));
}

TEST_F(ZunoFuncPath, MakesParentsOrWholeChainsWithAMode) {
  make_file("f");
  struct Row {
    std::string path;
    bool parent_only;
    int error;  // 0: succeeds
  };
  const Row rows[] = {
      {"", false, ENOENT},           {"", true, ENOENT},
      {"bare", true, ENOENT},        {"/", true, 0},
      {path("p/q/file"), true, 0},   {path("p//r///s/"), false, 0},
      {path("p"), false, 0},         {path("f"), false, ENOTDIR},
      {path("f/x"), false, ENOTDIR}, {path(std::string(256, 'n') + "/x"), false, ENAMETOOLONG},
  };
  const mode_t umask_before = umask(0022);
  for (const Row& row : rows) {
    SCOPED_TRACE(row.path);
    EXPECT_EQ(ZunoFunc::Recursive_Mkdir(row.path, 0771, row.parent_only, nullptr), row.error == 0);
    EXPECT_TRUE(row.error == 0 || errno == row.error) << errno;
  }
  umask(umask_before);
  EXPECT_THAT(tree_of(root()), ElementsAre("f=", "p/", "p/q/", "p/r/", "p/r/s/"));
  EXPECT_EQ(mode_of(path("p/q")), 0751U);
}

TEST_F(ZunoFuncPath, RemovesAllButDevicesWithoutFollowingLinks) {
  make_file("outside/kept");
  make_file("tree/.hidden/f");
  make_node("tree/fifo", S_IFIFO);
  make_node("tree/socket", S_IFSOCK);
  fs::create_directory_symlink(path("outside"), path("tree/link"));
  EXPECT_EQ(ZunoFunc::Remove_Dir(path("tree"), true), 0);
  EXPECT_THAT(tree_of(root()), ElementsAre("outside/", "outside/kept=", "tree/"));
  EXPECT_EQ(ZunoFunc::Remove_Dir(path("tree"), false), 0);
  EXPECT_THAT(tree_of(root()), ElementsAre("outside/", "outside/kept="));

  if (make_node("outside/device", S_IFCHR, makedev(1, 3)).empty()) {
    GTEST_SKIP() << "this process may not make device nodes";
  }
  EXPECT_EQ(ZunoFunc::Remove_Dir(path("outside"), true), 0);
  EXPECT_EQ(ZunoFunc::Remove_Dir(path("outside"), false), -1);
  EXPECT_EQ(errno, ENOTEMPTY);
  EXPECT_THAT(tree_of(root()), ElementsAre("outside/", "outside/device"));
}

TEST_F(ZunoFuncPath, SaysWhatItCannotRemove) {
  SKIP_WITHOUT_PRIVATE_ROOT();
  const std::string pinned = make_file("tree/d/pinned");
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

  fs::create_symlink("nowhere", path("dangling"));
  EXPECT_EQ(ZunoFunc::Remove_File(""), -2);
  EXPECT_EQ(ZunoFunc::Remove_File(pinned), 0);
  EXPECT_EQ(ZunoFunc::Remove_File(pinned), 0);
  EXPECT_EQ(ZunoFunc::Remove_File(path("dangling")), 0);
  EXPECT_EQ(ZunoFunc::Remove_File(root()), -1);
  EXPECT_EQ(errno, EISDIR);
  EXPECT_THAT(tree_of(root()), ElementsAre("dangling", "tree/", "tree/d/"));
}

TEST_F(ZunoFuncPath, CopiesListsAndRemovesDeepTreesOfAnyNamesWithFewDescriptors) {
  std::string deep = "from";
  for (int level = 0; level < 200; ++level) {
    deep += "/a";
  }
  for (const std::string& name : {std::string("line\nbreak"), std::string("\xff\xfe\x80"),
                                  std::string("%s 'quoted\""), std::string(255, 'n')}) {
    make_file(deep + "/" + name, name);
  }
  const std::set<std::string> tree = tree_of(path("from"));
  {
    CapturedStdout output;
    const sentrova::testing::DescriptorLimit few(4);
    EXPECT_EQ(ZunoFunc::copy_dir(path("from"), path("to")), 0);
    EXPECT_THAT(ZunoFunc::Files_In_Dir(path(deep)), SizeIs(4));
    EXPECT_EQ(ZunoFunc::Remove_Dir(path("from"), false), 0);
  }
  EXPECT_EQ(tree_of(path("to")), tree);
  EXPECT_EQ(ZunoFunc::Remove_Dir(path("to"), true), 0);
  EXPECT_THAT(tree_of(root()), ElementsAre("to/"));
}

TEST_F(ZunoFuncPath, ListsAndMatchesWhatItCanLookAt) {
  const std::string file = make_file("d/keep1");
  make_file("d/drop");
  make_directory("d/.keep");
  make_directory("d/keep2");
  fs::create_symlink("nowhere", path("d/keep3"));
  std::vector<std::string> names = {"before"};
  const auto keeps = [](const std::string& name) { return name.starts_with("keep"); };
  CapturedStdout output;
  EXPECT_THAT(ZunoFunc::Files_In_Dir(path("d")),
              UnorderedElementsAre(path("d/.keep"), path("d/drop"), file, path("d/keep2")));
  EXPECT_THAT(ZunoFunc::Files_In_Dir(path("missing")), IsEmpty());
  EXPECT_THAT(ZunoFunc::Files_In_Dir(file), IsEmpty());
  EXPECT_TRUE(ZunoFunc::GetMatchFileFromDir(path("d"), names, keeps));
  EXPECT_FALSE(ZunoFunc::GetMatchFileFromDir("", names, keeps));
  EXPECT_FALSE(ZunoFunc::GetMatchFileFromDir(path("missing"), names, keeps));
  EXPECT_FALSE(ZunoFunc::GetMatchFileFromDir(file, names, keeps));
  EXPECT_EQ(output.take(), "[ZunoFunc]I: Failed to stat " + path("d/keep3") +
                               " (No such file or directory)\n" +
                               "[ZunoFunc]I: Failed to opendir " + file + " (Not a directory)\n" +
                               "[ZunoFunc]E: Failed to opendir:" + file + " (Not a directory)\n");
  EXPECT_THAT(names, UnorderedElementsAre("before", "keep1", "keep2"));
  EXPECT_EQ(names.front(), "before");
  EXPECT_THROW(ZunoFunc::GetMatchFileFromDir(path("d"), names, nullptr), std::bad_function_call);

  // Of two entries, each of which deletes the other, one is there to be looked at.
  make_file("pair/one");
  make_file("pair/two");
  names.clear();
  const auto delete_the_other = [this](const std::string& name) {
    return unlink(path(name == "one" ? "pair/two" : "pair/one").c_str()) == 0;
  };
  EXPECT_TRUE(ZunoFunc::GetMatchFileFromDir(path("pair"), names, delete_the_other));
  ASSERT_THAT(names, SizeIs(1));
  EXPECT_THAT(tree_of(path("pair")), ElementsAre(names[0] + "="));
}

}  // namespace
