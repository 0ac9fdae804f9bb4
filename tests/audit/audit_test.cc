#include "platform/audit/audit.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>

#include <fstream>

#include "tests/support/temp_dir.h"

namespace {

TEST(AuditTest, RecordIsOneJsonLineWithTheFixedMembersFirst) {
  TslAudit_Attr attrs[] = {
      {"opId", "op-7"}, {"success", "spoofed"}, {"note", "a \"b\"\n"}, {"", ""}};
  // 2024-05-01T12:00:00.123Z
  std::string line = Tsl::Audit::FormatRecord(1714564800123456, "api.call", "<ATTEST>",
                                              "com.tarsel.orna.kms.status:get", true, attrs);
  EXPECT_EQ(line, R"({"time":"2024-05-01T12:00:00.123Z","eventId":"api.call","subject":"<ATTEST>",)"
                  R"("object":"com.tarsel.orna.kms.status:get","success":true,"opId":"op-7",)"
                  R"("note":"a \"b\"\n"})"
                  "\n");
}

TEST(AuditTest, FileSinkAppendsToAPrivateAuditLogUnderTheRoot) {
  ZyrdTest::TempDir root;
  setenv("ZYRD_ROOT", root.Path().c_str(), 1);
  TslAudit_Attr none[] = {{"", ""}};
  EXPECT_TRUE(TslAudit_LogList("api.call", "root", "a:b", true, none));
  EXPECT_TRUE(TslAudit_LogList("api.call", "root", "a:c", false, none));
  unsetenv("ZYRD_ROOT");
  std::string path = root / "var/log/zyrd/audit.log";
  struct stat st;
  ASSERT_EQ(stat(path.c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0600u);
  std::ifstream in(path);
  std::string first, second, third;
  EXPECT_TRUE(std::getline(in, first) && std::getline(in, second));
  EXPECT_FALSE(std::getline(in, third));
  EXPECT_NE(second.find(R"("object":"a:c","success":false)"), std::string::npos);
}

}  // namespace
