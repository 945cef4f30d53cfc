#include <gtest/gtest.h>

#include "keld/sync/DocumentRecord.h"

namespace droxa::keld {
namespace {

const std::string kDigest(64, 'a');

DocumentRecord document() {
  DocumentRecord made;
  made.record = "11111111-2222-3333-4444-555555555555";
  made.tag = "tag";
  made.parent = ContainerRecord("org.example.Sketches");
  made.name = "notes.txt";
  made.kind = NSFileProviderItemKind::document;
  made.content = {12, -34, kDigest, 0640};
  return made;
}

CKRecord record() {
  CKRecord made = MakeRecordWithContent(document());
  made.modifiedByDevice = "anna";
  return made;
}

template <class Value>
bool reads(const char *key, Value value) {
  CKRecord changed = record();
  changed.fields[key] = std::move(value);
  return ReadRecord(changed).has_value();
}

TEST(DocumentRecord, aDocumentComesBackAsItWas) {
  const auto read = ReadRecord(record());
  ASSERT_TRUE(read);
  EXPECT_EQ(read->record, document().record);
  EXPECT_EQ(read->tag, "tag");
  EXPECT_EQ(read->parent, document().parent);
  EXPECT_EQ(read->name, "notes.txt");
  EXPECT_EQ(read->kind, NSFileProviderItemKind::document);
  EXPECT_EQ(read->content, document().content);
  EXPECT_EQ(read->device, "anna");
}

TEST(DocumentRecord, aFolderAndALinkComeBackAsTheyWere) {
  DocumentRecord folder = document();
  folder.kind = NSFileProviderItemKind::folder;
  folder.content = {0, 0, "", 0750};
  const auto readFolder = ReadRecord(MakeRecord(folder));
  ASSERT_TRUE(readFolder);
  EXPECT_EQ(readFolder->kind, NSFileProviderItemKind::folder);
  EXPECT_EQ(readFolder->content.mode, 0750U);
  DocumentRecord link = folder;
  link.kind = NSFileProviderItemKind::symbolicLink;
  link.target = "../elsewhere";
  const auto readLink = ReadRecord(MakeRecord(link));
  ASSERT_TRUE(readLink);
  EXPECT_EQ(readLink->target, "../elsewhere");
}

TEST(DocumentRecord, whatUsersNoteComesBackAsItWas) {
  DocumentRecord noted = document();
  noted.metadata = ItemMetadata{{"Red", "Work"}, -5, 12};
  const auto read = ReadRecord(MakeRecordWithContent(noted));
  ASSERT_TRUE(read);
  EXPECT_EQ(read->metadata, noted.metadata);
  EXPECT_EQ(ReadRecord(record())->metadata, ItemMetadata()) << "of a record without it";
  for (const char *key : {kRecordKeyTags, kRecordKeyLastUsed, kRecordKeyFavoriteRank})
    EXPECT_EQ(record().fields.count(key), 0U) << key << " is left as it is";
  CKRecord nonsense = record();
  nonsense.fields[kRecordKeyTags] = std::int64_t{1};
  nonsense.fields[kRecordKeyFavoriteRank] = std::int64_t{-1};
  ASSERT_TRUE(ReadRecord(nonsense));
  EXPECT_EQ(ReadRecord(nonsense)->metadata, ItemMetadata());
}

TEST(DocumentRecord, whereItemsOfTheTrashWereComesBackAsItWas) {
  DocumentRecord trashed = document();
  trashed.parent = ContainerRecord("com.quorva.Tessaly.trash");
  trashed.putBack = PutBack{document().parent, "notes.txt", 5};
  const auto read = ReadRecord(MakeRecordWithContent(trashed));
  ASSERT_TRUE(read);
  EXPECT_EQ(read->putBack, trashed.putBack);
  CKRecord hostile = MakeRecordWithContent(trashed);
  hostile.fields[kRecordKeyPutBackName] = std::string("../../escape");
  ASSERT_TRUE(ReadRecord(hostile));
  EXPECT_FALSE(ReadRecord(hostile)->putBack);
  trashed.parent = document().parent;
  EXPECT_FALSE(ReadRecord(MakeRecordWithContent(trashed))->putBack) << "elsewhere";
  trashed = document();
  trashed.parent = ContainerRecord("com.quorva.Tessaly.trash");
  EXPECT_EQ(MakeRecord(trashed).fields.count(kRecordKeyPutBackParent), 0U) << "left as it is";
}

TEST(DocumentRecord, withoutItsContentsTheFieldsOfContentsAreLeftAlone) {
  const CKRecord without = MakeRecord(document());
  for (const char *key : {kQVRecordKeySize, kRecordKeyModified, kRecordKeyContent})
    EXPECT_EQ(without.fields.count(key), 0U) << key;
}

TEST(DocumentRecord, namesThatNoFileHasAreRefused) {
  for (const std::string &name : {std::string(), std::string("."), std::string(".."), std::string("a/b"),
                                  std::string("/"), std::string("a\0b", 3), std::string(256, 'n')})
    EXPECT_FALSE(reads(kRecordKeyName, name)) << name;
  for (const std::string &name : {std::string("..."), std::string(255, 'n'), std::string("\xff\n")})
    EXPECT_TRUE(reads(kRecordKeyName, name)) << name;
}

TEST(DocumentRecord, sizesKindsAndDatesThatCantBeAreRefused) {
  for (const std::int64_t size : {std::int64_t{-1}, INT64_MIN, INT64_MAX, std::int64_t{13}})
    EXPECT_FALSE(reads(kQVRecordKeySize, size)) << size;
  for (const std::int64_t kind : {std::int64_t{-1}, std::int64_t{4}, INT64_MAX, INT64_MIN})
    EXPECT_FALSE(reads(kRecordKeyKind, kind)) << kind;
  EXPECT_FALSE(reads(kRecordKeyKind, std::string("document")));
}

TEST(DocumentRecord, datesOfAnyYearAreRead) {
  for (const std::int64_t date : {std::int64_t{0}, std::int64_t{-1}, INT64_MIN, INT64_MAX})
    EXPECT_TRUE(reads(kRecordKeyModified, date)) << date;
}

TEST(DocumentRecord, modesAreModesAlone) {
  CKRecord changed = record();
  changed.fields[kRecordKeyMode] = std::int64_t{-1};
  ASSERT_TRUE(ReadRecord(changed));
  EXPECT_EQ(ReadRecord(changed)->content.mode, 07777U);
}

TEST(DocumentRecord, contentsThatNothingTellsAreRefused) {
  EXPECT_FALSE(reads(kRecordKeyContent, std::string("bytes")));
  EXPECT_FALSE(reads(kRecordKeyContent, CKAsset::assetWithReference({12, "../../etc"})));
  EXPECT_FALSE(reads(kRecordKeyContent, CKAsset::assetWithReference({11, kDigest})));
  CKRecord without = record();
  without.fields.erase(kRecordKeyContent);
  EXPECT_FALSE(ReadRecord(without));
}

TEST(DocumentRecord, parentsThatCantBeAreRefused) {
  EXPECT_FALSE(reads(kRecordKeyParent, std::string()));
  EXPECT_FALSE(reads(kRecordKeyParent, document().record)) << "itself";
  CKRecord without = record();
  without.fields.erase(kRecordKeyParent);
  EXPECT_FALSE(ReadRecord(without));
}

TEST(DocumentRecord, linksNeedTargetsThatCanBe) {
  DocumentRecord link = document();
  link.kind = NSFileProviderItemKind::symbolicLink;
  for (const std::string &target : {std::string(), std::string("a\0b", 3), std::string(4096, 't')}) {
    link.target = target;
    EXPECT_FALSE(ReadRecord(MakeRecord(link))) << target.size();
  }
}

TEST(DocumentRecord, anotherTypeIsNone) {
  CKRecord other = record();
  other.recordType = "share";
  EXPECT_FALSE(ReadRecord(other));
}

TEST(DocumentRecord, containersAreNamesWithoutWays) {
  EXPECT_EQ(ContainerOfRecord(ContainerRecord("org.example.Sketches")), "org.example.Sketches");
  for (const char *hostile : {"container:", "container:..", "container:a/b", "container:.droxa-private",
                              "else:org.example.Sketches", ""})
    EXPECT_FALSE(ContainerOfRecord(hostile)) << hostile;
}

TEST(DocumentRecord, newNamesDiffer) {
  EXPECT_NE(NewRecordName(), NewRecordName());
}

}  // namespace
}  // namespace droxa::keld
