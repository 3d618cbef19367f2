#include "device/init/supervisor.h"

#include <android-base/file.h>
#include <android-base/properties.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/prctl.h>
#include <sys/wait.h>

#include <filesystem>

#include "device/init/process.h"

namespace sentrova::device {
namespace {

// A property store, services that sleep, and a main program that is a line of shell.
class SupervisorTest : public testing::Test {
 protected:
  void SetUp() override {
    std::filesystem::create_directory(path("properties"));
    setenv("ANDROID_PROPERTY_DIR", path("properties").c_str(), 1);
    supervisor_ = Supervisor::create(services_);
    ASSERT_TRUE(supervisor_);
  }

  void TearDown() override {
    services_.stop("first");
    services_.stop("second");
    unsetenv("ANDROID_PROPERTY_DIR");
    for (const auto& entry : std::filesystem::directory_iterator(folder_.path)) {
      std::filesystem::remove_all(entry);
    }
  }

  std::string path(const std::string& name) const { return std::string(folder_.path) + "/" + name; }

  // The shell's way to set a property: beside it and renamed, as any other process would.
  std::string set(const std::string& name, const std::string& value) const {
    return "echo -n '" + value + "' >" + path("draft") + "; mv " + path("draft") + " " +
           path("properties/") + name + ";";
  }

  std::optional<Ending> run(const std::string& script) {
    return supervisor_->run_until_end(
        start_process({{"/bin/sh", "-c", script}, path("main.log"), ""}));
  }

  static std::string state(const std::string& service) {
    return android::base::GetProperty("init.svc." + service, "");
  }

  std::string text(const std::string& name) const {
    std::string text;
    android::base::ReadFileToString(path(name), &text);
    return text;
  }

  TemporaryDir folder_;
  Services services_{{{"first", {"/bin/sh", "-c", "exec sleep 60"}},
                      {"second", {"/bin/sh", "-c", "exec sleep 60"}},
                      {"absent", {"/nowhere/program"}}},
                     folder_.path};
  std::optional<Supervisor> supervisor_;
};

TEST_F(SupervisorTest, TellsHowTheMainProgramEnded) {
  const auto exited = run("exit 7");
  ASSERT_TRUE(exited);
  EXPECT_FALSE(exited->power_request);
  EXPECT_EQ(shell_status(exited->main_wait_status), 7);

  const auto killed = run("grep SigBlk /proc/self/status; kill -9 $$");
  ASSERT_TRUE(killed);
  EXPECT_EQ(shell_status(killed->main_wait_status), 128 + SIGKILL);
  EXPECT_EQ(text("main.log"), "SigBlk:\t0000000000000000\n");
}

TEST_F(SupervisorTest, AnswersQuickRequestsOfDifferentNamesAndIgnoresTheRest) {
  ASSERT_TRUE(services_.start("second"));
  ASSERT_TRUE(run(set("ctl.start", "first") + set("ctl.stop", "second")));
  ASSERT_TRUE(run(set("ctl.start", "unheard.of") + set("ctl.stop", "../first") +
                  set("sys.powerctl", "explode")));
  ASSERT_TRUE(run(set("ctl.start", "absent")));
  EXPECT_EQ(state("absent"), "");
  EXPECT_EQ(state("first"), "running");
  EXPECT_EQ(state("second"), "stopped");
}

TEST_F(SupervisorTest, ReapsOrphans) {
  ASSERT_EQ(prctl(PR_SET_CHILD_SUBREAPER, 1), 0);
  // The orphan outlives its parent and is gone when the main program ends.
  ASSERT_TRUE(run("sh -c 'sleep 0.1 & echo $! >" + path("orphan") + "'; sleep 0.3"));
  const pid_t orphan = atoi(text("orphan").c_str());
  ASSERT_GT(orphan, 0);
  EXPECT_EQ(waitpid(orphan, nullptr, WNOHANG), -1);
  EXPECT_EQ(errno, ECHILD);
  ASSERT_EQ(prctl(PR_SET_CHILD_SUBREAPER, 0), 0);
}

}  // namespace
}  // namespace sentrova::device
