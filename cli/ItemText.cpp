#include "cli/ItemText.h"

#include <array>
#include <nlohmann/json.hpp>

#include "cli/Text.h"

namespace droxa {

namespace {

using Json = nlohmann::ordered_json;

std::string dumped(const Json &json) {
  return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

std::string padded(std::string text, std::size_t width, bool right) {
  const std::size_t missing = text.size() < width ? width - text.size() : 0;
  return right ? std::string(missing, ' ') + text : text + std::string(missing, ' ');
}

std::string modeText(const NSFileProviderItemFields &item) {
  static constexpr std::array<char, 4> kTypes{'-', 'd', '@', 'l'};  // in the order of the kinds
  static constexpr char kLetters[] = "rwxrwxrwx";
  std::string text(1, kTypes.at(static_cast<std::size_t>(item.kind)));
  for (unsigned bit = 0; bit < 9; ++bit)
    text += (item.permissions >> (8 - bit) & 1U) != 0 ? kLetters[bit] : '-';
  return text;
}

// Where a document's contents are; "." for what has none of its own.
char contentsMark(const NSFileProviderItemFields &item) {
  if (item.kind != NSFileProviderItemKind::document) return '.';
  if (item.isExcludedFromSync) return 'x';
  if (!item.isDownloaded) return 'c';
  return item.isUploaded ? '-' : 'u';
}

Json dateJSON(const NSDate &date) {
  return date ? Json(isoTimeText(date.nanosecondsSince1970())) : Json(nullptr);
}

void addName(Json &json, const char *key, const std::string &name) {
  json[key] = name;
  if (!isValidUTF8(name)) json[std::string(key) + "Bytes"] = base64Text(name);
}

Json itemObject(const NSFileProviderItemFields &item) {
  Json json;
  json["identifier"] = item.itemIdentifier;
  json["parent"] = item.parentItemIdentifier;
  addName(json, "name", item.filename);
  json["kind"] = kindText(item.kind);
  json["type"] = item.typeIdentifier;
  json["size"] = item.documentSize;
  json["created"] = dateJSON(item.creationDate);
  json["modified"] = dateJSON(item.contentModificationDate);
  json["lastUsed"] = dateJSON(item.lastUsedDate);
  json["permissions"] = item.permissions;
  json["rank"] = item.changeRank;
  json["favoriteRank"] = item.favoriteRank;
  json["tags"] =
      base64Text({reinterpret_cast<const char *>(item.tagData.bytes().data()), item.tagData.length()});
  json["tagNames"] = Json::array();
  for (const FPTag &tag : FPGetTagsFromTagsData(item.tagData)) json["tagNames"].push_back(tag.label);
  json["trashed"] = item.isTrashed;
  json["excludedFromSync"] = item.isExcludedFromSync;
  json["downloaded"] = item.isDownloaded;
  json["uploaded"] = item.isUploaded;
  json["shared"] = item.isShared;
  return json;
}

std::string dateText(const NSDate &date) {
  return date ? isoTimeText(date.nanosecondsSince1970()) + " (" + localTimeText(date.nanosecondsSince1970()) +
                    ")"
              : "never";
}

std::string flagsText(const NSFileProviderItemFields &item) {
  std::string text;
  const auto add = [&text](bool isSet, const char *word) {
    if (isSet) text += (text.empty() ? "" : ", ") + std::string(word);
  };
  add(item.isTrashed, "trashed");
  add(item.isExcludedFromSync, "excluded from sync");
  add(item.isDownloaded, "downloaded");
  add(item.isUploaded, "uploaded");
  add(item.isShared, "shared");
  return text.empty() ? "none" : text;
}

std::string tagsText(const NSFileProviderItemFields &item) {
  std::string text;
  for (const FPTag &tag : FPGetTagsFromTagsData(item.tagData)) {
    text += (text.empty() ? "" : ", ") + tagText(tag);
  }
  return text.empty() ? "none" : text;
}

const char *changeWord(FPDChange::Kind kind) {
  switch (kind) {
    case FPDChange::Kind::added:
      return "added";
    case FPDChange::Kind::changed:
      return "changed";
    case FPDChange::Kind::renamed:
      return "renamed";
    case FPDChange::Kind::removed:
      return "removed";
    case FPDChange::Kind::relisted:
      return "relisted";
  }
  return "changed";
}

}  // namespace

std::string tagText(const FPTag &tag) {
  static constexpr std::array<const char *, 8> kColors{"",     "grey",   "green", "purple",
                                                       "blue", "yellow", "red",   "orange"};
  const std::string label = escapedText(tag.label);
  const bool hasColor = tag.color != 0 && tag.color < kColors.size();
  return hasColor ? label + " (" + kColors.at(tag.color) + ")" : label;
}

std::string kindText(NSFileProviderItemKind kind) {
  switch (kind) {
    case NSFileProviderItemKind::document:
      return "document";
    case NSFileProviderItemKind::folder:
      return "folder";
    case NSFileProviderItemKind::alias:
      return "alias";
    case NSFileProviderItemKind::symbolicLink:
      return "symbolicLink";
  }
  return "document";
}

std::string longLine(const NSFileProviderItemFields &item) {
  return modeText(item) + " " + contentsMark(item) + " " +
         padded(std::to_string(item.documentSize), 12, true) + "  " +
         padded(localTimeText(item.contentModificationDate.nanosecondsSince1970()), 16, false) + "  " +
         padded(item.itemIdentifier, 8, false) + "  " + escapedText(item.filename);
}

std::string propertyLines(const NSFileProviderItemFields &item) {
  const auto line = [](const char *name, const std::string &value) {
    return padded(name, 13, false) + value + "\n";
  };
  return line("name:", escapedText(item.filename)) + line("identifier:", item.itemIdentifier) +
         line("parent:", item.parentItemIdentifier) + line("kind:", kindText(item.kind)) +
         line("type:", escapedText(item.typeIdentifier)) + line("size:", std::to_string(item.documentSize)) +
         line("permissions:", modeText(item)) + line("created:", dateText(item.creationDate)) +
         line("modified:", dateText(item.contentModificationDate)) +
         line("last used:", dateText(item.lastUsedDate)) + line("tags:", tagsText(item)) +
         line("favourite:", item.favoriteRank == 0 ? "no" : std::to_string(item.favoriteRank)) +
         line("rank:", std::to_string(item.changeRank)) + line("state:", flagsText(item));
}

std::string itemJSON(const NSFileProviderItemFields &item) {
  return dumped(itemObject(item));
}

std::string treeJSON(const NSFileProviderItemFields &item, const std::string &path, std::size_t depth) {
  Json json;
  json["depth"] = depth;
  addName(json, "path", path);
  json.update(itemObject(item));
  return dumped(json);
}

std::string changeLine(const FPDChange &change) {
  const std::string name = change.item ? escapedText(change.item->filename) : std::string();
  const std::string identifier = "  (" + change.identifier + ")";
  switch (change.kind) {
    case FPDChange::Kind::added:
      return "+ " + name + identifier;
    case FPDChange::Kind::changed:
      return "~ " + name + identifier;
    case FPDChange::Kind::renamed:
      return "> " + escapedText(change.oldName) + " -> " + name + identifier;
    case FPDChange::Kind::removed:
      return "- " + (change.oldName.empty() ? "?" : escapedText(change.oldName)) + identifier;
    case FPDChange::Kind::relisted:
      return "* listed anew: changes may have been missed" + identifier;
  }
  return {};
}

std::string changeJSON(const FPDChange &change) {
  Json json;
  json["change"] = changeWord(change.kind);
  json["identifier"] = change.identifier;
  if (!change.oldName.empty()) addName(json, "oldName", change.oldName);
  if (change.item) json["item"] = itemObject(*change.item);
  return dumped(json);
}

}  // namespace droxa
