#include <gtest/gtest.h>
#include <limits>

#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "platform/oslog/LogFormat.h"

namespace droxa {
namespace {

using log_format_detail::agrees;

static_assert(agrees<>("no conversion, 100%%"));
static_assert(agrees<std::string, int>("%@ %d"));
static_assert(agrees<const char (&)[3], std::uint64_t>("%s %llx"));
static_assert(agrees<double>("%.3f"));
static_assert(agrees<std::uint64_t>("%lu") && agrees<std::int64_t>("%lld"));
static_assert(!agrees<>("%d"), "an argument is missing");
static_assert(!agrees<int>("nothing"), "an argument is left over");
static_assert(!agrees<int>("%@"), "an integer has no description");
static_assert(!agrees<std::string>("%d"), "a text is no integer");
static_assert(!agrees<std::uint64_t>("%x"), "too wide");
static_assert(!agrees<NSURL>("%s"), "an object is no text");
static_assert(!agrees<int>("%f") && !agrees<double>("%d"));
static_assert(!agrees<int>("%q") && !agrees<int>("%"), "unknown conversions");

TEST(LogFormat, printsDescriptions) {
  EXPECT_EQ(NSStringWithFormat("%@ asked for %@", std::string("x"), NSURL::fileURLWithPath("/a")),
            "x asked for file:///a");
  EXPECT_EQ(NSStringWithFormat("%@", NSError::errorWithPOSIXCode(2)),
            "Error Domain=NSPOSIXErrorDomain Code=2 \"No such file or directory\"");
}

TEST(LogFormat, printsNilAsNull) {
  EXPECT_EQ(NSStringWithFormat("%@ %@ %@ %@", NSURL(), NSError(), NSData(), std::optional<std::string>()),
            "(null) (null) (null) (null)");
  EXPECT_EQ(
      NSStringWithFormat("%@ %s", std::shared_ptr<const NSObject>(), static_cast<const char *>(nullptr)),
      "(null) (null)");
}

TEST(LogFormat, printsAListInOneLine) {
  EXPECT_EQ(NSStringWithFormat("%@", std::vector<std::string>{"a", "b"}), "(a, b)");
  EXPECT_EQ(NSStringWithFormat("%@", std::vector<std::string>{}), "()");
}

TEST(LogFormat, printsIntegersOfEveryWidth) {
  EXPECT_EQ(NSStringWithFormat("%d %u %x", -1, 4294967295U, 255), "-1 4294967295 ff");
  EXPECT_EQ(NSStringWithFormat("%lld %llu", std::numeric_limits<std::int64_t>::min(),
                               std::numeric_limits<std::uint64_t>::max()),
            "-9223372036854775808 18446744073709551615");
  EXPECT_EQ(NSStringWithFormat("%llx %lu", std::uint64_t{0xdeadbeefcafe}, std::size_t{7}), "deadbeefcafe 7");
  EXPECT_EQ(NSStringWithFormat("%d %d", true, false), "1 0");
}

TEST(LogFormat, aNegativeIntIsUnsignedInItsOwnWidth) {
  EXPECT_EQ(NSStringWithFormat("%x %u", -1, -1), "ffffffff 4294967295");
  EXPECT_EQ(NSStringWithFormat("%llx", std::int64_t{-1}), "ffffffffffffffff");
}

TEST(LogFormat, printsWidthsAndPrecisions) {
  EXPECT_EQ(NSStringWithFormat("%.2f|%08llx|%3d", 1.005, std::uint64_t{255}, 7), "1.00|000000ff|  7");
  EXPECT_EQ(NSStringWithFormat("%f", 0.5), "0.500000");
}

TEST(LogFormat, printsPercentSigns) {
  EXPECT_EQ(NSStringWithFormat("100%% of %d%%", 5), "100% of 5%");
}

TEST(LogFormat, anArgumentIsNeverAFormat) {
  EXPECT_EQ(NSStringWithFormat("%s|%@", "%d %s %n", std::string("%@")), "%d %s %n|%@");
}

TEST(LogFormat, keepsBytesThatAreNoText) {
  const std::string raw("a\0b\n\xff", 5);
  EXPECT_EQ(NSStringWithFormat("<%@>", raw), "<" + raw + ">");
}

}  // namespace
}  // namespace droxa
