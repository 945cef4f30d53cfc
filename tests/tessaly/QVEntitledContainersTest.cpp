#include <gtest/gtest.h>

#include "tessaly/QVEntitledContainers.h"

namespace droxa {
namespace {

using Texts = std::vector<std::string>;
using Entitlements = std::map<std::string, EntitlementValue>;

TEST(QVEntitledContainers, withTheServiceTheListedOnesInTheirOrder) {
  EXPECT_EQ(QVEntitledContainerIdentifiers({{QVDroxaServicesEntitlement, Texts{"Other", "CloudDocuments"}},
                                            {QVDroxaContainerIdentifiersEntitlement, Texts{"b", "a"}}}),
            (Texts{"b", "a"}));
}

TEST(QVEntitledContainers, withTheServiceAndNoListTheApplicationsOwn) {
  EXPECT_EQ(
      QVEntitledContainerIdentifiers({{QVDroxaServicesEntitlement, std::string("CloudDocuments")},
                                      {QVApplicationIdentifierEntitlement, std::string("org.example.A")}}),
      (Texts{"org.example.A"}));
}

TEST(QVEntitledContainers, withoutTheServiceTheListCountsForNothing) {
  EXPECT_EQ(QVEntitledContainerIdentifiers({{QVDroxaContainerIdentifiersEntitlement, Texts{"a"}},
                                            {QVApplicationIdentifierEntitlement, std::string("x")}}),
            Texts{});
  EXPECT_EQ(QVEntitledContainerIdentifiers({{QVDroxaServicesEntitlement, Texts{"Records"}},
                                            {QVDroxaContainerIdentifiersEntitlement, Texts{"a"}}}),
            Texts{});
}

TEST(QVEntitledContainers, ubiquityContainersComeAfterwardsAndEachOnce) {
  const Entitlements entitlements{{QVDroxaServicesEntitlement, Texts{"CloudDocuments"}},
                                  {QVDroxaContainerIdentifiersEntitlement, Texts{"a", "b", "a"}},
                                  {QVUbiquityContainerIdentifiersEntitlement, Texts{"c", "b"}}};
  EXPECT_EQ(QVEntitledContainerIdentifiers(entitlements), (Texts{"a", "b", "c"}));
  EXPECT_EQ(QVEntitledContainerIdentifiers({{QVUbiquityContainerIdentifiersEntitlement, std::string("c")}}),
            (Texts{"c"}));
}

TEST(QVEntitledContainers, nothingGrantsNothing) {
  EXPECT_EQ(QVEntitledContainerIdentifiers({}), Texts{});
  EXPECT_EQ(QVEntitledContainerIdentifiers({{QVUbiquityContainerIdentifiersEntitlement, true}}), Texts{});
}

}  // namespace
}  // namespace droxa
