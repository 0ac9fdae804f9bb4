#include "platform/runtime/config.h"

#include <gtest/gtest.h>

#include <fstream>

#include "daemon/settings.h"
#include "platform/runtime/app.h"
#include "platform/util/feature_state.h"
#include "platform/util/log.h"
#include "tests/support/temp_dir.h"

namespace {

using Strake::Service::Config;

std::shared_ptr<Config> Defaults() {
  auto config = Strake::Service::CreateScratchConfig();
  Zyrd::Settings::WriteDefaults(*config);
  return config;
}

TEST(Config, TheSixDefaultsAndAFileThatOverridesOnlyWhatItNames) {
  auto config = Defaults();
  config->MergeXmlText("<config/>");
  EXPECT_EQ(config->GetString("log/level", ""), "info");
  EXPECT_TRUE(config->GetBool("caching", false));
  EXPECT_EQ(config->GetInt("statusUpdateIntervalSeconds", 0), 300);
  EXPECT_EQ(config->GetInt("cacheStaleTimeoutSeconds", 0), 1800);
  EXPECT_EQ(config->GetInt("strake/threadPool/ioThreads", 0), 1);
  EXPECT_EQ(config->GetInt("strake/threadPool/maxThreads", 0), 10);
  EXPECT_FALSE(config->Has("statsLogIntervalSeconds"));

  config->MergeXmlText(
      "<?xml version=\"1.0\"?>\n<config>\n  <log><level>verbose</level></log>\n"
      "  <caching>false</caching>\n  <!-- comment -->\n"
      "  <strake><threadPool><maxThreads>20</maxThreads></threadPool></strake>\n"
      "  <statsLogIntervalSeconds>900</statsLogIntervalSeconds>\n</config>\n");
  EXPECT_EQ(config->GetString("log/level", ""), "verbose");
  EXPECT_FALSE(config->GetBool("caching", true));
  EXPECT_EQ(config->GetInt("strake/threadPool/maxThreads", 0), 20);
  EXPECT_EQ(config->GetInt("strake/threadPool/ioThreads", 0), 1);
  EXPECT_EQ(config->GetInt("cacheStaleTimeoutSeconds", 0), 1800);
  EXPECT_EQ(config->GetInt("statsLogIntervalSeconds", 0), 900);
}

TEST(Config, UnusableTextThrowsAndChangesNothingAndBadValuesFallBack) {
  auto config = Defaults();
  for (const char* bad : {"<config><caching>false</caching>", "not xml at all",
                          "<settings><caching>false</caching></settings>",
                          "<config><caching>false</caching></config><config/>"}) {
    EXPECT_THROW(config->MergeXmlText(bad), std::runtime_error) << bad;
    EXPECT_TRUE(config->GetBool("caching", false)) << bad;
  }
  // Nesting the reader would recurse into without bound, and a document
  // larger than any configuration, are refused the same way.
  std::string nested;
  for (int i = 0; i < 20000; ++i) nested += "<a>";
  EXPECT_THROW(config->MergeXmlText("<config>" + nested + "</config>"), std::runtime_error);
  EXPECT_THROW(config->MergeXmlText("<config><c>" + std::string(2 << 20, 'x') + "</c></config>"),
               std::runtime_error);
  // Markup inside comments, attribute values and CDATA is not nesting.
  config->MergeXmlText(
      "<config><!-- <a><a><a> --><k>v<![CDATA[<a><a>]]></k><e x=\"<a>\"/><f/></config>");
  EXPECT_EQ(config->GetString("k", ""), "v<a><a>");
  EXPECT_TRUE(config->Has("f"));

  config->SetString("n", "12x");
  config->SetString("b", "maybe");
  config->SetString("neg", "-5");
  config->SetString("yes", "TRUE");
  config->SetString("huge", "99999999999999999999");
  config->SetString("tiny", "-99999999999999999999");
  EXPECT_EQ(config->GetInt("n", 7), 7);
  EXPECT_TRUE(config->GetBool("b", true));
  EXPECT_EQ(config->GetInt("neg", 0), -5);
  EXPECT_TRUE(config->GetBool("yes", false));
  EXPECT_EQ(config->GetInt("huge", 7), INT64_MAX);  // beyond 64 bits: the bound, not the default
  EXPECT_EQ(config->GetInt("tiny", 7), INT64_MIN);
  EXPECT_EQ(Zyrd::Settings::ClampStatusUpdateInterval(config->GetInt("huge", 300)), 3600);
}

TEST(InitApp, UnreadableFileLeavesDefaultsInForceAndStillInstallsTheApp) {
  EXPECT_THROW(Strake::Service::InitApp(Defaults(), "/nonexistent/zyrd/config.xml"),
               std::runtime_error);
  ASSERT_NE(Strake::Service::GetApp(), nullptr);
  EXPECT_EQ(Strake::Service::GetApp()->GetConfig().GetInt("cacheStaleTimeoutSeconds", 0), 1800);
  EXPECT_EQ(Groundwork::GetLogThreshold(), 5);
}

TEST(InitApp, AppliesLogLevelAndFeatureSwitches) {
  ZyrdTest::TempDir dir;
  std::ofstream(dir / "config.xml") << "<config><log><level>error</level></log>"
                                       "<features><credentialGet>true</credentialGet></features>"
                                       "</config>";
  int saved = Groundwork::GetLogThreshold();
  FeatureState_Init();
  EXPECT_EQ(*FeatureList[kFeatureCredentialGet], 0);
  Strake::Service::InitApp(Defaults(), dir / "config.xml");
  EXPECT_EQ(Groundwork::GetLogThreshold(), 2);
  EXPECT_EQ(*FeatureList[kFeatureCredentialGet], 1);
  Groundwork::SetLogThreshold(saved);
  FeatureState_Init();
}

}  // namespace
