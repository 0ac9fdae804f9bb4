#include "platform/ssl/firewall_utils.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>

#include "tests/support/log_capture.h"
#include "tests/support/temp_dir.h"

namespace {

using Kestrel::Common::FirewallUtils::AddOrRemoveServer;

class FirewallUtilsTest : public ::testing::Test {
 protected:
  void SetUp() override { setenv("ZYRD_ROOT", root_.Path().c_str(), 1); }
  void TearDown() override { unsetenv("ZYRD_ROOT"); }

  std::string File() const { return root_ / "var/lib/zyrd/firewall/rs"; }
  struct stat Stat() const {
    struct stat st {};
    EXPECT_EQ(stat(File().c_str(), &st), 0);
    return st;
  }

  ZyrdTest::TempDir root_;
  ZyrdTest::LogCapture log_;
};

TEST_F(FirewallUtilsTest, KeepsASortedSetAndLeavesTheFileAloneWhenNothingChanges) {
  EXPECT_TRUE(AddOrRemoveServer("rs", false, "absent"));  // no file yet
  EXPECT_TRUE(AddOrRemoveServer("rs", true, "b.example"));
  EXPECT_TRUE(AddOrRemoveServer("rs", true, "::1"));
  EXPECT_TRUE(AddOrRemoveServer("rs", true, "a.example"));
  EXPECT_EQ(ZyrdTest::ReadFile(File()), "::1\na.example\nb.example\n");
  EXPECT_EQ(Stat().st_mode & 07777, 0644u);

  const ino_t inode = Stat().st_ino;
  EXPECT_TRUE(AddOrRemoveServer("rs", true, "a.example"));
  EXPECT_TRUE(AddOrRemoveServer("rs", false, "c.example"));
  EXPECT_EQ(Stat().st_ino, inode);  // not rewritten

  EXPECT_TRUE(AddOrRemoveServer("rs", false, "a.example"));
  EXPECT_EQ(ZyrdTest::ReadFile(File()), "::1\nb.example\n");
  EXPECT_NE(Stat().st_ino, inode);  // replaced, not written in place
}

TEST_F(FirewallUtilsTest, RefusesNamesThatCannotBeOneLineAndFilesItCannotWrite) {
  std::filesystem::create_directories(root_ / "var/lib/zyrd");
  for (const char* host : {"", "a b", "a\nb.example", "tab\t", "\x80x"}) {
    EXPECT_FALSE(AddOrRemoveServer("rs", true, host)) << host;
  }
  EXPECT_FALSE(AddOrRemoveServer("../escape", true, "a"));
  EXPECT_FALSE(AddOrRemoveServer("..", true, "a"));

  // A file where the directory belongs: nothing can be written.
  std::ofstream(root_ / "var/lib/zyrd/firewall") << "in the way";
  EXPECT_FALSE(AddOrRemoveServer("rs", true, "b"));
  EXPECT_EQ(log_.Count("Firewall ruleset rs: "), 1u);
}

}  // namespace
