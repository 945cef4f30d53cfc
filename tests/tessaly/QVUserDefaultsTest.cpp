#include <gtest/gtest.h>

#include "platform/oslog/os_log.h"
#include "tessaly/QVUserDefaults.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

class UserDefaults : public testing::Test {
 protected:
  void SetUp() override { QVUserDefaults::forget(); }
  void TearDown() override { QVUserDefaults::forget(); }
  const QVUserDefaults &withFile(const std::string &text) {
    path_ = home_.write("config/defaults.json", text);
    QVUserDefaults::forget();
    return QVUserDefaults::standardUserDefaults();
  }
  std::string warningAbout(const std::string &key, const std::string &range, const std::string &used) const {
    return "[WARNING] " + path_ + ": " + key + " must be a whole number from " + range + "; " + used +
           " is used";
  }
  const ScratchHome home_;
  const OSLogCapture capture_;
  std::string path_;
};

}  // namespace

TEST_F(UserDefaults, withoutAFileTheBuiltInValuesHold) {
  const QVUserDefaults &defaults = QVUserDefaults::standardUserDefaults();
  EXPECT_EQ(defaults.maxRecordCountInFetchRecordsOperation(), 200);
  EXPECT_EQ(defaults.daemonCallDeadlineMilliseconds(), 30'000);
  EXPECT_TRUE(capture_.lines().empty());
}

TEST_F(UserDefaults, theFilesValuesHoldOverThem) {
  const QVUserDefaults &defaults =
      withFile(R"({"maxRecordCountInFetchRecordsOperation": 50, "somethingElse": "kept for later"})");
  EXPECT_EQ(defaults.maxRecordCountInFetchRecordsOperation(), 50);
  EXPECT_EQ(defaults.daemonCallDeadlineMilliseconds(), 30'000);
  EXPECT_TRUE(capture_.lines().empty());
}

TEST_F(UserDefaults, theFileIsReadOnce) {
  withFile(R"({"daemonCallDeadlineMilliseconds": 5})");
  home_.write("config/defaults.json", R"({"daemonCallDeadlineMilliseconds": 6})");
  EXPECT_EQ(QVUserDefaults::standardUserDefaults().daemonCallDeadlineMilliseconds(), 5);
}

TEST_F(UserDefaults, aBadValueIsReportedAndTheBuiltInOneKept) {
  for (const char *value :
       {"0", "-1", "\"fast\"", "1.5", "null", "86400001", "18446744073709551615", "1e3"}) {
    const QVUserDefaults &defaults =
        withFile(std::string(R"({"daemonCallDeadlineMilliseconds": )") + value + "}");
    EXPECT_EQ(defaults.daemonCallDeadlineMilliseconds(), 30'000) << value;
  }
  ASSERT_EQ(capture_.lines().size(), 8U);
  for (const OSLogLine &line : capture_.lines()) {
    EXPECT_EQ(line.text, warningAbout("daemonCallDeadlineMilliseconds", "1 to 86400000", "30000"));
    EXPECT_EQ(line.type, os_log_type_t::normal);
  }
}

TEST_F(UserDefaults, oneBadValueLeavesTheOthers) {
  const QVUserDefaults &defaults =
      withFile(R"({"maxRecordCountInFetchRecordsOperation": 0, "daemonCallDeadlineMilliseconds": 7})");
  EXPECT_EQ(defaults.daemonCallDeadlineMilliseconds(), 7);
  EXPECT_EQ(capture_.texts(), std::vector<std::string>({warningAbout("maxRecordCountInFetchRecordsOperation",
                                                                     "1 to 1000000", "200")}));
}

TEST_F(UserDefaults, aFileThatIsNoObjectIsReported) {
  EXPECT_EQ(withFile("[1]").daemonCallDeadlineMilliseconds(), 30'000);
  EXPECT_EQ(capture_.texts(),
            std::vector<std::string>(
                {"[WARNING] " + path_ + ": isn't a JSON object; the built-in defaults are used"}));
}

}  // namespace droxa
