#include <gtest/gtest.h>

#include "tessaly/QVErrors.h"

namespace droxa {

TEST(TessalyErrors, loggedOutIsCode2) {
  EXPECT_TRUE(qvc_errorLoggedOut().is(QVTessalyErrorDomain, 2));
  EXPECT_EQ(qvc_errorLoggedOut().localizedDescription(), "nobody is signed in");
}

TEST(TessalyErrors, noSuchItemNamesWhatWasAskedFor) {
  const NSError error = qvc_errorNoSuchItem("d12");
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, 14));
  EXPECT_EQ(error.localizedDescription(), "there is no item d12");
}

TEST(TessalyErrors, anErrorSaysWhatItIsToldToSay) {
  const NSError error = qvc_error(QVErrorDatabase, "the database is damaged");
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, 30));
  EXPECT_EQ(error.localizedDescription(), "the database is damaged");
}

}  // namespace droxa
