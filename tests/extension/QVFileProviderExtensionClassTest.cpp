#include <cstdio>
#include <fstream>

#include "extension/QVPersonaRemembering.h"
#include "tests/extension/ExtensionFixture.h"

namespace droxa {
namespace {

class ExtensionClass : public ExtensionTest {
 protected:
  void setReplacementFlag(const std::string &value) {
    std::filesystem::create_directories(home.flags() + "/DroxaDrive");
    std::ofstream(home.flags() + "/DroxaDrive/FPFS_Return") << value;
  }
};

TEST_F(ExtensionClass, installsBothPersonaHooksForAManagedProvider) {
  QVContainerCache::setManagedProviderForTesting(true);
  QVFileProviderExtension::initialize();
  EXPECT_EQ(qvc_block_remember_persona, &QVRememberPersonaOfBlock);
  EXPECT_EQ(qvc_activity_block_remember_persona, &QVRememberPersonaOfActivity);
  EXPECT_EQ(logged(), Lines{});
}

TEST_F(ExtensionClass, installsNoHooksForAnyOtherProvider) {
  QVContainerCache::setManagedProviderForTesting(false);
  QVFileProviderExtension::initialize();
  EXPECT_EQ(qvc_block_remember_persona, nullptr);
  EXPECT_EQ(qvc_activity_block_remember_persona, nullptr);
}

TEST_F(ExtensionClass, theReplacementFeatureEndsTheProcess) {
  EXPECT_EXIT(
      {
        setReplacementFlag("1");
        QVFileProviderExtension::initialize();
      },
      testing::ExitedWithCode(1), "");
}

TEST_F(ExtensionClass, theReplacementFeatureEndsTheProcessAtTheFirstInit) {
  EXPECT_EXIT(
      {
        setReplacementFlag("1");
        QVFileProviderExtension::init();
      },
      testing::ExitedWithCode(1), "");
}

// The end of the process tells of the lines that were logged, and of the hooks.
OSLogCapture *linesOfTheEnd = nullptr;
void tellAtTheEnd() {
  for (const std::string &line : logLines(*linesOfTheEnd)) std::fprintf(stderr, "%s\n", line.c_str());
  std::fprintf(stderr, "hooks %s\n", qvc_block_remember_persona ? "stand" : "don't stand");
}

TEST_F(ExtensionClass, theEndSaysWhyAndComesAfterTheHooks) {
  EXPECT_EXIT(
      {
        linesOfTheEnd = &capture;
        std::atexit(tellAtTheEnd);
        setReplacementFlag("1");
        QVContainerCache::setManagedProviderForTesting(true);
        QVFileProviderExtension::initialize();
      },
      testing::ExitedWithCode(1),
      "debug: \\[DEBUG\\] Not allowing legacy extension to start when fpfs is enabled\nhooks stand");
}

TEST_F(ExtensionClass, aDisabledReplacementFeatureLetsTheProcessLive) {
  setReplacementFlag("0");
  QVFileProviderExtension::initialize();
  EXPECT_EQ(logged(), Lines{});
}

}  // namespace
}  // namespace droxa
