#include <gtest/gtest.h>

#include "tessaly/QVFileCoordinatorReadingOptions.h"

namespace droxa {

TEST(ReadingOptions, arePrintedWithTheirNames) {
  EXPECT_EQ(QVFileCoordinatorReadingOptionsPrettyPrint(0), "0 (none)");
  EXPECT_EQ(QVFileCoordinatorReadingOptionsPrettyPrint(0x20001),
            "0x20001 (without changes | forced download)");
  EXPECT_EQ(QVFileCoordinatorReadingOptionsPrettyPrint(2), "0x2 (resolves symbolic link)");
  EXPECT_EQ(QVFileCoordinatorReadingOptionsPrettyPrint(12),
            "0xc (immediately available metadata only | for uploading)");
}

TEST(ReadingOptions, bitsWithoutANameArePrintedInHexadecimal) {
  EXPECT_EQ(QVFileCoordinatorReadingOptionsPrettyPrint(0x41), "0x41 (without changes | 0x40)");
  EXPECT_EQ(QVFileCoordinatorReadingOptionsPrettyPrint(0x8000000000000010),
            "0x8000000000000010 (0x8000000000000010)");
}

}  // namespace droxa
