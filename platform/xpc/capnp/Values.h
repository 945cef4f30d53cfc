#pragma once

#include <capnp/common.h>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/fileprovider/NSFileProviderItem.h"
#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "platform/xpc/Values.capnp.h"

// Values into and out of messages. Readers throw when a message makes no sense: its call then fails.
// The set… and get… forms take the message that has a field of that name; nil is written as nothing.
// Thread contract: the loop.

namespace droxa {

inline capnp::Data::Reader xpcBytes(std::string_view text) {
  return {reinterpret_cast<const kj::byte *>(text.data()), text.size()};
}
inline capnp::Data::Reader xpcBytes(const NSData &data) {
  return {data.bytes().data(), data.length()};
}
inline std::string xpcString(capnp::Data::Reader bytes) {
  return {reinterpret_cast<const char *>(bytes.begin()), bytes.size()};
}
inline NSData xpcData(capnp::Data::Reader bytes) {
  return NSData::dataWithBytes(bytes.begin(), bytes.size());
}

void writeURL(schema::Url::Builder builder, const NSURL &url);
NSURL readURL(schema::Url::Reader reader);
// Underlying errors beyond a depth, and entries beyond a number, are left out.
void writeError(schema::Error::Builder builder, const NSError &error);
NSError readError(schema::Error::Reader reader);
// Beyond a number of entries, the others are left out; what makes no sense, or too deep errors, are refused.
unsigned userInfoSize(const NSUserInfo &userInfo);
void writeUserInfo(capnp::List<schema::Error::UserInfo>::Builder list, const NSUserInfo &userInfo);
NSUserInfo readUserInfo(capnp::List<schema::Error::UserInfo>::Reader list);
void writeItem(schema::Item::Builder builder, const NSFileProviderItemFields &fields);
NSFileProviderItemFields readItem(schema::Item::Reader reader);

template <class Builder>
void setError(Builder message, const NSError &error) {
  if (error) writeError(message.initError(), error);
}
template <class Reader>
NSError getError(Reader message) {
  return message.hasError() ? readError(message.getError()) : NSError();
}
template <class Builder>
void setURL(Builder message, const NSURL &url) {
  if (url) writeURL(message.initUrl(), url);
}
template <class Reader>
NSURL getURL(Reader message) {
  return message.hasUrl() ? readURL(message.getUrl()) : NSURL();
}
template <class Builder>
void setIdentifier(Builder message, const std::optional<std::string> &identifier) {
  if (identifier) message.setIdentifier(xpcBytes(*identifier));
}
template <class Reader>
std::optional<std::string> getIdentifier(Reader message) {
  return message.hasIdentifier() ? std::optional(xpcString(message.getIdentifier())) : std::nullopt;
}
// The field of a null item is left out.
template <class Builder>
void setItem(Builder message, const std::shared_ptr<const NSFileProviderItem> &item) {
  if (item) writeItem(message.initItem(), item->fields());
}
template <class Reader>
std::shared_ptr<const NSFileProviderItem> getItem(Reader message) {
  return message.hasItem() ? std::make_shared<NSFileProviderPlainItem>(readItem(message.getItem())) : nullptr;
}

// Lists: `list` is what init…(size) gave.
template <class List>
void writeStrings(List list, const std::vector<std::string> &strings) {
  for (unsigned index = 0; index < list.size(); ++index) list.set(index, xpcBytes(strings[index]));
}
template <class List>
std::vector<std::string> readStrings(List list) {
  std::vector<std::string> strings;
  strings.reserve(list.size());
  for (const auto bytes : list) strings.push_back(xpcString(bytes));
  return strings;
}
void writeItems(capnp::List<schema::Item>::Builder list, const NSFileProviderItems &items);
NSFileProviderItems readItems(capnp::List<schema::Item>::Reader list);

// The size of a list on its way into a message.
template <class Container>
unsigned xpcCount(const Container &container) {
  return static_cast<unsigned>(container.size());
}

}  // namespace droxa
