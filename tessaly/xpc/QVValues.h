#pragma once

#include <memory>
#include <optional>

#include "platform/xpc/capnp/Values.h"
#include "tessaly/QVFileObjectID.h"
#include "tessaly/QVProtocol.h"
#include "tessaly/QVQueryItem.h"
#include "tessaly/xpc/QVProtocol.capnp.h"
#include "tessaly/xpc/QVQueryItem.capnp.h"

// The library's values into and out of messages; see platform/xpc/capnp/Values.h.

namespace droxa {

QVFileObjectID readFileObjectID(capnp::Data::Reader bytes);
std::shared_ptr<const QVQueryItem> readQueryItem(schema::QVQueryItem::Reader reader);
void writeQueryItem(schema::QVQueryItem::Builder builder, const QVQueryItem &item);
QVQueryItems readQueryItems(capnp::List<schema::QVQueryItem>::Reader list);
void writeQueryItems(capnp::List<schema::QVQueryItem>::Builder list, const QVQueryItems &items);

template <class Builder>
void setQueryItem(Builder message, const std::shared_ptr<const QVQueryItem> &item) {
  if (item) writeQueryItem(message.initItem(), *item);
}
template <class Reader>
std::shared_ptr<const QVQueryItem> getQueryItem(Reader message) {
  return message.hasItem() ? readQueryItem(message.getItem()) : nullptr;
}

void writeContainers(capnp::List<schema::QVProtocol::Container>::Builder list,
                     const std::vector<QVContainerDescription> &containers);
std::vector<QVContainerDescription> readContainers(capnp::List<schema::QVProtocol::Container>::Reader list);

void writeAccount(schema::QVProtocol::Account::Builder builder, const QVAccountDescription &account);
QVAccountDescription readAccount(schema::QVProtocol::Account::Reader reader);
template <class Builder>
void setAccount(Builder message, const std::optional<QVAccountDescription> &account) {
  if (account) writeAccount(message.initAccount(), *account);
}
template <class Reader>
std::optional<QVAccountDescription> getAccount(Reader message) {
  return message.hasAccount() ? std::optional(readAccount(message.getAccount())) : std::nullopt;
}

void writeMetadataChange(schema::QVProtocol::MetadataChange::Builder builder,
                         const QVItemMetadataChange &change);
QVItemMetadataChange readMetadataChange(schema::QVProtocol::MetadataChange::Reader reader);

void writeStatus(schema::QVProtocol::Status::Builder builder, const QVDaemonStatus &status);
QVDaemonStatus readStatus(schema::QVProtocol::Status::Reader reader);

}  // namespace droxa
