#pragma once

// What every daemon must do, as one suite: include this in one source file of a test program and instantiate
// it with the worlds to run it in, and DaemonContentsConformance with
// the same: a world without dataless documents skips it.
//
//   INSTANTIATE_TEST_SUITE_P(Fake, DaemonConformance, testing::Values(DaemonWorldMaker{"InProcess",
//   makeWorld}),
//                            ConformanceName);

#include "tests/support/conformance/Account.h"
#include "tests/support/conformance/Contents.h"
#include "tests/support/conformance/DaemonConformanceFixture.h"
#include "tests/support/conformance/Listing.h"
#include "tests/support/conformance/Lookup.h"
#include "tests/support/conformance/Senders.h"
#include "tests/support/conformance/WorkingSet.h"
