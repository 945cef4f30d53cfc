#include "platform/xpc/capnp/Values.h"

#include <kj/debug.h>
#include <memory>
#include <utility>
#include <variant>

namespace droxa {
namespace {

constexpr unsigned MaximumErrorDepth = 8;
constexpr unsigned MaximumUserInfoEntries = 64;

void writeErrorAtDepth(schema::Error::Builder builder, const NSError &error, unsigned depth);
NSError readErrorAtDepth(schema::Error::Reader reader, unsigned depth);

struct UserInfoWriter {
  schema::Error::UserInfo::Builder entry;
  unsigned depth;

  void operator()(const std::string &text) { entry.setText(xpcBytes(text)); }
  void operator()(std::int64_t integer) { entry.setInteger(integer); }
  void operator()(const NSError &error) { writeErrorAtDepth(entry.initError(), error, depth + 1); }
  void operator()(const NSURL &url) { writeURL(entry.initUrl(), url); }
  void operator()(const std::shared_ptr<const NSObject> &object) {
    if (const auto *item = dynamic_cast<const NSFileProviderItem *>(object.get())) {
      writeItem(entry.initItem(), item->fields());
    } else {
      entry.setDescription(xpcBytes(object->description()));
    }
  }
};

// Nil values carry nothing, and errors below the deepest level are left out.
bool crosses(const NSUserInfoValue &value, unsigned depth) {
  if (const auto *error = std::get_if<NSError>(&value)) return *error && depth + 1 < MaximumErrorDepth;
  if (const auto *url = std::get_if<NSURL>(&value)) return static_cast<bool>(*url);
  if (const auto *object = std::get_if<std::shared_ptr<const NSObject>>(&value)) return *object != nullptr;
  return true;
}

using UserInfoList = capnp::List<schema::Error::UserInfo>;

unsigned sizeAtDepth(const NSUserInfo &userInfo, unsigned depth) {
  unsigned size = 0;
  for (const auto &entry : userInfo)
    if (crosses(entry.second, depth) && size < MaximumUserInfoEntries) ++size;
  return size;
}

// `list` has the size that sizeAtDepth() gives.
void writeUserInfoAtDepth(UserInfoList::Builder list, const NSUserInfo &userInfo, unsigned depth) {
  unsigned index = 0;
  for (const auto &[key, value] : userInfo) {
    if (!crosses(value, depth) || index == list.size()) continue;
    auto entry = list[index++];
    entry.setKey(xpcBytes(key));
    std::visit(UserInfoWriter{entry, depth}, value);
  }
}

void writeErrorAtDepth(schema::Error::Builder builder, const NSError &error, unsigned depth) {
  builder.setDomain(xpcBytes(error.domain()));
  builder.setCode(error.code());
  const unsigned size = sizeAtDepth(error.userInfo(), depth);
  if (size != 0) writeUserInfoAtDepth(builder.initUserInfo(size), error.userInfo(), depth);
}

NSUserInfoValue readValue(schema::Error::UserInfo::Reader entry, unsigned depth) {
  using Kind = schema::Error::UserInfo;
  switch (entry.which()) {
    case Kind::TEXT:
      return xpcString(entry.getText());
    case Kind::INTEGER:
      return entry.getInteger();
    case Kind::ERROR:
      return readErrorAtDepth(entry.getError(), depth + 1);
    case Kind::URL:
      return readURL(entry.getUrl());
    case Kind::ITEM:
      return std::shared_ptr<const NSObject>(
          std::make_shared<NSFileProviderPlainItem>(readItem(entry.getItem())));
    case Kind::DESCRIPTION:
      return xpcString(entry.getDescription());
  }
  KJ_FAIL_REQUIRE("an error's user info of an unknown kind");
}

NSUserInfo readUserInfoAtDepth(UserInfoList::Reader list, unsigned depth) {
  KJ_REQUIRE(list.size() <= MaximumUserInfoEntries, "a user info is too long");
  NSUserInfo info;
  for (const auto entry : list) info[xpcString(entry.getKey())] = readValue(entry, depth);
  return info;
}

NSError readErrorAtDepth(schema::Error::Reader reader, unsigned depth) {
  KJ_REQUIRE(depth < MaximumErrorDepth, "an error with too many errors beneath");
  return {xpcString(reader.getDomain()), reader.getCode(), readUserInfoAtDepth(reader.getUserInfo(), depth)};
}

NSDate dateIf(bool exists, std::int64_t nanoseconds) {
  return exists ? NSDate::dateWithNanosecondsSince1970(nanoseconds) : NSDate();
}

}  // namespace

void writeURL(schema::Url::Builder builder, const NSURL &url) {
  if (url.isFileURL()) {
    builder.setPath(xpcBytes(url.path()));
  } else {
    builder.setText(xpcBytes(url.absoluteString()));
  }
  builder.setPhysical(url.hasPhysicalProperty());
}

NSURL readURL(schema::Url::Reader reader) {
  const NSURL url = reader.isPath() ? NSURL::fileURLWithPath(xpcString(reader.getPath()))
                                    : NSURL::URLWithString(xpcString(reader.getText()));
  KJ_REQUIRE(static_cast<bool>(url), "bytes that make no URL");
  return reader.getPhysical() ? url.URLWithPhysicalProperty() : url;
}

void writeError(schema::Error::Builder builder, const NSError &error) {
  writeErrorAtDepth(builder, error, 0);
}

NSError readError(schema::Error::Reader reader) {
  return readErrorAtDepth(reader, 0);
}

unsigned userInfoSize(const NSUserInfo &userInfo) {
  return sizeAtDepth(userInfo, 0);
}

void writeUserInfo(UserInfoList::Builder list, const NSUserInfo &userInfo) {
  writeUserInfoAtDepth(list, userInfo, 0);
}

NSUserInfo readUserInfo(UserInfoList::Reader list) {
  return readUserInfoAtDepth(list, 0);
}

void writeItem(schema::Item::Builder builder, const NSFileProviderItemFields &fields) {
  builder.setItemIdentifier(xpcBytes(fields.itemIdentifier));
  builder.setParentItemIdentifier(xpcBytes(fields.parentItemIdentifier));
  builder.setFilename(xpcBytes(fields.filename));
  builder.setTypeIdentifier(xpcBytes(fields.typeIdentifier));
  if (fields.tagData) builder.setTagData(xpcBytes(fields.tagData));
  builder.setDocumentSize(fields.documentSize);
  builder.setCreationDate(fields.creationDate.nanosecondsSince1970());
  builder.setContentModificationDate(fields.contentModificationDate.nanosecondsSince1970());
  builder.setLastUsedDate(fields.lastUsedDate.nanosecondsSince1970());
  builder.setChangeRank(fields.changeRank);
  builder.setFavoriteRank(fields.favoriteRank);
  builder.setPermissions(fields.permissions);
  builder.setKind(static_cast<std::uint8_t>(fields.kind));
  builder.setHasCreationDate(static_cast<bool>(fields.creationDate));
  builder.setHasContentModificationDate(static_cast<bool>(fields.contentModificationDate));
  builder.setHasLastUsedDate(static_cast<bool>(fields.lastUsedDate));
  builder.setIsTrashed(fields.isTrashed);
  builder.setIsExcludedFromSync(fields.isExcludedFromSync);
  builder.setIsDownloaded(fields.isDownloaded);
  builder.setIsUploaded(fields.isUploaded);
  builder.setIsShared(fields.isShared);
}

NSFileProviderItemFields readItem(schema::Item::Reader reader) {
  KJ_REQUIRE(reader.getKind() <= static_cast<std::uint8_t>(NSFileProviderItemKind::symbolicLink),
             "an item of an unknown kind");
  NSFileProviderItemFields fields;
  fields.itemIdentifier = xpcString(reader.getItemIdentifier());
  fields.parentItemIdentifier = xpcString(reader.getParentItemIdentifier());
  fields.filename = xpcString(reader.getFilename());
  fields.typeIdentifier = xpcString(reader.getTypeIdentifier());
  if (reader.hasTagData()) fields.tagData = xpcData(reader.getTagData());
  fields.documentSize = reader.getDocumentSize();
  fields.creationDate = dateIf(reader.getHasCreationDate(), reader.getCreationDate());
  fields.contentModificationDate =
      dateIf(reader.getHasContentModificationDate(), reader.getContentModificationDate());
  fields.lastUsedDate = dateIf(reader.getHasLastUsedDate(), reader.getLastUsedDate());
  fields.changeRank = reader.getChangeRank();
  fields.favoriteRank = reader.getFavoriteRank();
  fields.permissions = reader.getPermissions();
  fields.kind = static_cast<NSFileProviderItemKind>(reader.getKind());
  fields.isTrashed = reader.getIsTrashed();
  fields.isExcludedFromSync = reader.getIsExcludedFromSync();
  fields.isDownloaded = reader.getIsDownloaded();
  fields.isUploaded = reader.getIsUploaded();
  fields.isShared = reader.getIsShared();
  return fields;
}

void writeItems(capnp::List<schema::Item>::Builder list, const NSFileProviderItems &items) {
  for (unsigned index = 0; index < list.size(); ++index) writeItem(list[index], items[index]->fields());
}

NSFileProviderItems readItems(capnp::List<schema::Item>::Reader list) {
  NSFileProviderItems items;
  items.reserve(list.size());
  for (const auto item : list) items.push_back(std::make_shared<NSFileProviderPlainItem>(readItem(item)));
  return items;
}

}  // namespace droxa
