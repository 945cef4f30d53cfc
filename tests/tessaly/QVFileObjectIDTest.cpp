#include <gtest/gtest.h>
#include <set>
#include <string>
#include <unordered_set>

#include "tessaly/QVFileObjectID.h"

namespace droxa {

TEST(FileObjectID, aDocumentIsDAndItsNumber) {
  const QVFileObjectID document = QVFileObjectID::documentID(12);
  EXPECT_EQ(document.asString(), "d12");
  EXPECT_EQ(document.description(), "d12");
  EXPECT_TRUE(document.isDocumentID());
  EXPECT_FALSE(document.isFolderOrAliasID());
  EXPECT_EQ(document.number(), 12U);
}

TEST(FileObjectID, aFolderOrAliasIsIAndItsNumber) {
  const QVFileObjectID folder = QVFileObjectID::folderOrAliasID(UINT64_MAX);
  EXPECT_EQ(folder.asString(), "i18446744073709551615");
  EXPECT_TRUE(folder.isFolderOrAliasID());
  EXPECT_FALSE(folder.isDocumentID());
}

TEST(FileObjectID, everyIdentifierIsReadBackFromItsString) {
  for (const std::uint64_t number :
       {std::uint64_t{1}, std::uint64_t{10}, std::uint64_t{1} << 32, UINT64_MAX}) {
    for (const QVFileObjectID &id :
         {QVFileObjectID::documentID(number), QVFileObjectID::folderOrAliasID(number)})
      EXPECT_EQ(QVFileObjectID::fileObjectIDWithString(id.asString()), id);
  }
}

TEST(FileObjectID, whatIsNotExactlyAnIdentifierIsNone) {
  for (const std::string &text : {std::string(),
                                  std::string("d"),
                                  std::string("i"),
                                  std::string("12"),
                                  std::string("d0"),
                                  std::string("i01"),
                                  std::string("d+1"),
                                  std::string("d-1"),
                                  std::string("d 1"),
                                  std::string(" d1"),
                                  std::string("d1 "),
                                  std::string("d1\n"),
                                  std::string("D1"),
                                  std::string("x1"),
                                  std::string("d1a"),
                                  std::string("d0x1"),
                                  std::string("d18446744073709551616"),
                                  std::string("d99999999999999999999999"),
                                  std::string("d1\0", 3),
                                  std::string("NSFileProviderRootContainerItemIdentifier")})
    EXPECT_EQ(QVFileObjectID::fileObjectIDWithString(text), std::nullopt) << text;
}

TEST(FileObjectID, theKindIsPartOfTheIdentity) {
  const QVFileObjectID document = QVFileObjectID::documentID(7);
  const QVFileObjectID folder = QVFileObjectID::folderOrAliasID(7);
  EXPECT_NE(document, folder);
  EXPECT_EQ((std::set<QVFileObjectID>{document, folder, document}).size(), 2U);
  EXPECT_EQ((std::unordered_set<QVFileObjectID>{document, folder, document}).size(), 2U);
}

}  // namespace droxa
