#include "tessaly/xpc/QVValues.h"

#include <kj/debug.h>
#include <utility>

namespace droxa {

QVFileObjectID readFileObjectID(capnp::Data::Reader bytes) {
  const auto identifier =
      QVFileObjectID::fileObjectIDWithString({reinterpret_cast<const char *>(bytes.begin()), bytes.size()});
  KJ_REQUIRE(identifier.has_value(), "bytes that make no file object identifier");
  return *identifier;
}

std::shared_ptr<const QVQueryItem> readQueryItem(schema::QVQueryItem::Reader reader) {
  const auto fields = reader.getFields();
  return std::make_shared<QVQueryItem>(readFileObjectID(fields.getItemIdentifier()), readItem(fields),
                                       static_cast<bool>(reader.getIsDead()));
}

void writeQueryItem(schema::QVQueryItem::Builder builder, const QVQueryItem &item) {
  writeItem(builder.initFields(), item.fields());
  builder.setIsDead(item.isDead());
}

QVQueryItems readQueryItems(capnp::List<schema::QVQueryItem>::Reader list) {
  QVQueryItems items;
  items.reserve(list.size());
  for (const auto item : list) items.push_back(readQueryItem(item));
  return items;
}

void writeQueryItems(capnp::List<schema::QVQueryItem>::Builder list, const QVQueryItems &items) {
  for (unsigned index = 0; index < list.size(); ++index) writeQueryItem(list[index], *items[index]);
}

void writeContainers(capnp::List<schema::QVProtocol::Container>::Builder list,
                     const std::vector<QVContainerDescription> &containers) {
  for (unsigned index = 0; index < list.size(); ++index) {
    const QVContainerDescription &container = containers[index];
    auto builder = list[index];
    builder.setContainerID(xpcBytes(container.containerID));
    setURL(builder, container.url);
    if (container.documentsURL) writeURL(builder.initDocumentsURL(), container.documentsURL);
    if (container.documentsID) builder.setDocumentsID(xpcBytes(container.documentsID->asString()));
  }
}

std::vector<QVContainerDescription> readContainers(capnp::List<schema::QVProtocol::Container>::Reader list) {
  std::vector<QVContainerDescription> containers;
  containers.reserve(list.size());
  for (const auto reader : list) {
    QVContainerDescription container;
    container.containerID = xpcString(reader.getContainerID());
    container.url = getURL(reader);
    if (reader.hasDocumentsURL()) container.documentsURL = readURL(reader.getDocumentsURL());
    if (reader.hasDocumentsID()) container.documentsID = readFileObjectID(reader.getDocumentsID());
    containers.push_back(std::move(container));
  }
  return containers;
}

void writeAccount(schema::QVProtocol::Account::Builder builder, const QVAccountDescription &account) {
  builder.setName(xpcBytes(account.name));
  if (account.perAppAccountIdentifier) {
    builder.setPerAppAccountIdentifier(xpcBytes(*account.perAppAccountIdentifier));
  }
}

QVAccountDescription readAccount(schema::QVProtocol::Account::Reader reader) {
  QVAccountDescription account;
  account.name = xpcString(reader.getName());
  if (reader.hasPerAppAccountIdentifier()) {
    account.perAppAccountIdentifier = xpcString(reader.getPerAppAccountIdentifier());
  }
  return account;
}

void writeMetadataChange(schema::QVProtocol::MetadataChange::Builder builder,
                         const QVItemMetadataChange &change) {
  builder.setSetsTags(change.tags.has_value());
  builder.setSetsLastUsed(change.lastUsed.has_value());
  builder.setSetsFavoriteRank(change.favoriteRank.has_value());
  builder.setLastUsed(change.lastUsed.value_or(0));
  builder.setFavoriteRank(change.favoriteRank.value_or(0));
  if (!change.tags) return;
  auto tags = builder.initTags(xpcCount(*change.tags));
  for (unsigned index = 0; index < tags.size(); ++index) tags.set(index, xpcBytes((*change.tags)[index]));
}

QVItemMetadataChange readMetadataChange(schema::QVProtocol::MetadataChange::Reader reader) {
  QVItemMetadataChange change;
  if (reader.getSetsTags()) {
    change.tags.emplace();
    for (const auto tag : reader.getTags()) change.tags->push_back(xpcString(tag));
  }
  if (reader.getSetsLastUsed()) change.lastUsed = reader.getLastUsed();
  if (reader.getSetsFavoriteRank()) change.favoriteRank = reader.getFavoriteRank();
  return change;
}

void writeStatus(schema::QVProtocol::Status::Builder builder, const QVDaemonStatus &status) {
  builder.setProcessIdentifier(status.processIdentifier);
  builder.setStartedNanoseconds(status.startedNanoseconds);
  builder.setRank(status.rank);
  builder.setDocuments(status.documents);
  builder.setFolders(status.folders);
  builder.setAliases(status.aliases);
  builder.setPendingScans(status.pendingScans);
  builder.setSenders(status.senders);
  builder.setWatcher(xpcBytes(status.watcher));
  builder.setFirstScanDone(status.firstScanDone);
  builder.setDatabaseBytes(status.databaseBytes);
}

QVDaemonStatus readStatus(schema::QVProtocol::Status::Reader reader) {
  QVDaemonStatus status;
  status.processIdentifier = reader.getProcessIdentifier();
  status.startedNanoseconds = reader.getStartedNanoseconds();
  status.rank = reader.getRank();
  status.documents = reader.getDocuments();
  status.folders = reader.getFolders();
  status.aliases = reader.getAliases();
  status.pendingScans = reader.getPendingScans();
  status.senders = reader.getSenders();
  status.watcher = xpcString(reader.getWatcher());
  status.firstScanDone = reader.getFirstScanDone();
  status.databaseBytes = reader.getDatabaseBytes();
  return status;
}

}  // namespace droxa
