#include "tests/support/FakeDrive.h"

#include <algorithm>
#include <atomic>
#include <cstdlib>

#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVContainer.h"

namespace droxa {

namespace {

std::string lastDotComponent(const std::string &text) {
  return text.substr(text.rfind('.') + 1);
}

void sortItems(QVQueryItems &items, std::int64_t sortOrder) {
  const bool byDate = sortOrder == static_cast<std::int64_t>(QVSortOrder::byDate);
  std::sort(items.begin(), items.end(), [byDate](const auto &left, const auto &right) {
    const NSFileProviderItemFields &a = left->fields();
    const NSFileProviderItemFields &b = right->fields();
    if (byDate && a.contentModificationDate != b.contentModificationDate)
      return a.contentModificationDate > b.contentModificationDate;
    if (a.filename != b.filename) return a.filename < b.filename;
    return left->fileObjectID().number() < right->fileObjectID().number();
  });
}

}  // namespace

FakeDrive::FakeDrive(std::string replica)
    : replica_(std::move(replica)), identity_([] {
        static std::atomic<std::uint64_t> drives{0};
        return "drive " + std::to_string(++drives) + " rank ";
      }()) {
  std::vector<FakeDriveChange> ignored;
  addContainer(QVUbiquitousDefaultContainerID, ignored);
  root_ = containers_.at(QVUbiquitousDefaultContainerID);
  addContainer(QVUbiquitousDocumentsContainerID, ignored);
  addContainer(QVUbiquitousDesktopContainerID, ignored);
  addContainer(QVUbiquitousTrashContainerID, ignored);
}

bool FakeDrive::add(const std::string &path, const Attributes &attributes,
                    std::vector<FakeDriveChange> &changes) {
  const auto place = parentAndName(path);
  if (!place || childNamed(place->first, place->second) != 0) return false;
  if (attributes.number) nextNumber_ = std::max(nextNumber_, *attributes.number);
  if (attributes.number && nodes_.count(*attributes.number) != 0) return false;
  Node node;
  node.number = attributes.number.value_or(0);
  node.parent = place->first;
  node.name = place->second;
  node.kind = attributes.kind;
  node.size = attributes.size;
  node.modified = attributes.modifiedNanoseconds;
  node.contents.isDataless = attributes.isDataless;
  const std::uint64_t number = insert(std::move(node));
  changes.push_back({item(number), {}, foldersAbove(number)});
  return true;
}

bool FakeDrive::setContents(const std::string &path, std::uint64_t size, std::int64_t modifiedNanoseconds,
                            std::vector<FakeDriveChange> &changes) {
  const std::uint64_t number = numberAtPath(path);
  if (number == 0) return false;
  Node &node = nodes_.at(number);
  node.size = size;
  node.modified = modifiedNanoseconds;
  bump(node);
  changes.push_back({item(number), foldersAbove(number), foldersAbove(number)});
  return true;
}

bool FakeDrive::rename(const std::string &from, const std::string &to,
                       std::vector<FakeDriveChange> &changes) {
  const std::uint64_t number = numberAtPath(from);
  const auto place = parentAndName(to);
  if (number == 0 || nodes_.at(number).isContainer || !place) return false;
  if (childNamed(place->first, place->second) != 0) return false;
  const std::vector<std::uint64_t> before = foldersAbove(number);
  Node &node = nodes_.at(number);
  node.parent = place->first;
  node.name = place->second;
  bump(node);
  changes.push_back({item(number), before, foldersAbove(number)});
  return true;
}

bool FakeDrive::remove(const std::string &path, std::vector<FakeDriveChange> &changes) {
  const std::uint64_t number = numberAtPath(path);
  if (number == 0 || nodes_.at(number).isContainer) return false;
  kill(number, changes);
  return true;
}

bool FakeDrive::addContainer(const std::string &containerID, std::vector<FakeDriveChange> &changes) {
  if (containers_.count(containerID) != 0) return false;
  Node node;
  node.parent = root_;
  node.name = containerID;
  node.kind = NSFileProviderItemKind::folder;
  node.isContainer = true;
  const std::uint64_t number = insert(std::move(node));
  containers_[containerID] = number;
  if (isListed(nodes_.at(number))) changes.push_back({item(number), {}, foldersAbove(number)});
  return true;
}

bool FakeDrive::removeContainer(const std::string &containerID, std::vector<FakeDriveChange> &changes) {
  const auto number = containerNumber(containerID);
  if (!number || *number == root_) return false;
  kill(*number, changes);
  containers_.erase(containerID);
  return true;
}

void FakeDrive::setReadable(const std::string &path, bool readable) {
  nodes_.at(numberAtPath(path)).readable = readable;
}

std::uint64_t FakeDrive::insert(Node node) {
  if (node.number == 0) node.number = nextNumber_;
  nextNumber_ = std::max(nextNumber_, node.number) + 1;
  const std::uint64_t number = node.number;
  bump(nodes_[number] = std::move(node));
  return number;
}

void FakeDrive::bump(Node &node) {
  byRank_.erase(node.rank);
  node.rank = ++rank_;
  if (isListed(node)) byRank_[node.rank] = node.number;
}

// The children die before their folder, so that a death never leaves an item without a parent.
void FakeDrive::kill(std::uint64_t number, std::vector<FakeDriveChange> &changes) {
  for (const std::uint64_t child : childNumbers(number)) kill(child, changes);
  const Node &node = nodes_.at(number);
  const QVFileObjectID fileObjectID = itemOf(node)->fileObjectID();
  std::vector<std::uint64_t> before = foldersAbove(number);
  byRank_.erase(node.rank);
  dead_.emplace(++rank_, fileObjectID);
  NSFileProviderItemFields fields = itemOf(node)->fields();
  fields.changeRank = rank_;
  nodes_.erase(number);
  changes.push_back(
      {std::make_shared<const QVQueryItem>(fileObjectID, std::move(fields), true), std::move(before), {}});
}

std::optional<std::pair<std::uint64_t, std::string>> FakeDrive::parentAndName(const std::string &path) const {
  const std::size_t slash = path.rfind('/');
  const std::uint64_t parent = slash == std::string::npos ? root_ : numberAtPath(path.substr(0, slash));
  std::string name = slash == std::string::npos ? path : path.substr(slash + 1);
  if (parent == 0 || !isFolder(parent) || name.empty() || name == "." || name == "..") return std::nullopt;
  return std::make_pair(parent, std::move(name));
}

std::uint64_t FakeDrive::numberAtPath(const std::string &path) const {
  std::string rest = path;
  std::uint64_t number = root_;
  if (!path.empty() && path[0] == '/') {
    number = 0;
    for (const auto &entry : containers_) {
      const std::string folder = replica_ + "/" + entry.first + "/" + QVDocumentsFolderName(entry.first);
      if (path != folder && path.compare(0, folder.size() + 1, folder + "/") != 0) continue;
      number = entry.second;
      rest = path == folder ? std::string() : path.substr(folder.size() + 1);
    }
  }
  while (number != 0 && !rest.empty()) {
    const std::size_t slash = rest.find('/');
    number = childNamed(number, rest.substr(0, slash));
    rest = slash == std::string::npos ? std::string() : rest.substr(slash + 1);
  }
  return number;
}

std::uint64_t FakeDrive::childNamed(std::uint64_t parent, const std::string &name) const {
  for (const auto &entry : nodes_)
    if (entry.second.parent == parent && !entry.second.isContainer && entry.second.name == name)
      return entry.first;
  return 0;
}

std::vector<std::uint64_t> FakeDrive::childNumbers(std::uint64_t folder) const {
  std::vector<std::uint64_t> numbers;
  for (const auto &entry : nodes_)
    if (entry.second.parent == folder) numbers.push_back(entry.first);
  return numbers;
}

std::uint64_t FakeDrive::numberOf(const QVFileObjectID &fileObjectID) const {
  const auto found = nodes_.find(fileObjectID.number());
  return found != nodes_.end() && itemOf(found->second)->fileObjectID() == fileObjectID ? found->first : 0;
}

std::shared_ptr<const QVQueryItem> FakeDrive::item(std::uint64_t number) const {
  return itemOf(nodes_.at(number));
}

NSURL FakeDrive::url(std::uint64_t number) const {
  const Node &node = nodes_.at(number);
  if (node.isContainer)
    return NSURL::fileURLWithPath(replica_ + "/" + node.name + "/" + QVDocumentsFolderName(node.name));
  return url(node.parent).URLByAppendingPathComponent(node.name);
}

std::optional<std::uint64_t> FakeDrive::containerNumber(const std::string &containerID) const {
  const auto found = containers_.find(containerID);
  if (found == containers_.end()) return std::nullopt;
  return found->second;
}

bool FakeDrive::isFolder(std::uint64_t number) const {
  const auto found = nodes_.find(number);
  return found != nodes_.end() && found->second.kind == NSFileProviderItemKind::folder;
}

std::vector<std::uint64_t> FakeDrive::foldersAbove(std::uint64_t number) const {
  std::vector<std::uint64_t> folders;
  for (std::uint64_t parent = nodes_.at(number).parent; parent != 0; parent = nodes_.at(parent).parent)
    folders.push_back(parent);
  return folders;
}

std::vector<QVContainerDescription> FakeDrive::containers() const {
  std::vector<QVContainerDescription> descriptions;
  for (const auto &entry : containers_) {
    QVContainerDescription description;
    description.containerID = entry.first;
    description.url = NSURL::fileURLWithPath(replica_ + "/" + entry.first);
    description.documentsURL = url(entry.second);
    if (entry.second != root_) description.documentsID = QVFileObjectID::folderOrAliasID(entry.second);
    descriptions.push_back(std::move(description));
  }
  return descriptions;
}

std::uint64_t FakeDrive::count(NSFileProviderItemKind kind) const {
  return static_cast<std::uint64_t>(std::count_if(
      nodes_.begin(), nodes_.end(), [kind](const auto &entry) { return entry.second.kind == kind; }));
}

bool FakeDrive::isListed(const Node &node) const {
  return node.parent != 0 && !(node.isContainer && node.name == QVUbiquitousTrashContainerID);
}

QVQueryItems FakeDrive::children(std::uint64_t folder, std::int64_t sortOrder) const {
  QVQueryItems items;
  for (const auto &entry : nodes_)
    if (entry.second.parent == folder && isListed(entry.second)) items.push_back(itemOf(entry.second));
  sortItems(items, sortOrder);
  return items;
}

QVQueryItems FakeDrive::allFolders(std::int64_t sortOrder) const {
  QVQueryItems items;
  for (const auto &entry : nodes_)
    if (isFolder(entry.first) && isListed(entry.second)) items.push_back(itemOf(entry.second));
  sortItems(items, sortOrder);
  return items;
}

std::string FakeDrive::containerOf(const Node &node) const {
  const Node *at = &node;
  while (!at->isContainer) at = &nodes_.at(at->parent);
  return at->name;
}

bool FakeDrive::isExcluded(const Node &node) const {
  for (const Node *at = &node; !at->isContainer; at = &nodes_.at(at->parent))
    if (qv_isNameExcludedFromSync(at->name)) return true;
  return false;
}

std::string FakeDrive::filename(const Node &node) const {
  if (!node.isContainer) return node.name;
  std::string name = node.name == QVUbiquitousDocumentsContainerID ? "Documents"
                     : node.name == QVUbiquitousDesktopContainerID ? "Desktop"
                                                                   : lastDotComponent(node.name);
  if (childNamed(root_, name) != 0) name += " (" + node.name + ")";
  return name;
}

std::shared_ptr<const QVQueryItem> FakeDrive::itemOf(const Node &node) const {
  const bool isDocument =
      node.kind == NSFileProviderItemKind::document || node.kind == NSFileProviderItemKind::symbolicLink;
  const QVFileObjectID fileObjectID =
      isDocument ? QVFileObjectID::documentID(node.number) : QVFileObjectID::folderOrAliasID(node.number);
  NSFileProviderItemFields fields;
  fields.itemIdentifier = fileObjectID.asString();
  fields.parentItemIdentifier = node.parent == root_ || node.parent == 0
                                    ? NSFileProviderRootContainerItemIdentifier
                                    : QVFileObjectID::folderOrAliasID(node.parent).asString();
  fields.filename = filename(node);
  fields.kind = node.kind;
  fields.typeIdentifier = node.kind == NSFileProviderItemKind::folder     ? "inode/directory"
                          : node.kind == NSFileProviderItemKind::document ? "application/octet-stream"
                                                                          : "inode/symlink";
  fields.documentSize = node.kind == NSFileProviderItemKind::folder ? 0 : node.size;
  fields.contentModificationDate = NSDate::dateWithNanosecondsSince1970(node.modified);
  fields.permissions = node.kind == NSFileProviderItemKind::folder ? 0755 : 0644;
  fields.changeRank = node.rank;
  fields.isTrashed = !node.isContainer && containerOf(node) == QVUbiquitousTrashContainerID;
  fields.isExcludedFromSync = isExcluded(node);
  fields.isDownloaded = !node.contents.isDataless;
  fields.isShared = node.contents.isShared;
  const std::int64_t lastUsed = node.metadata.lastUsed;
  if (lastUsed != 0) fields.lastUsedDate = NSDate::dateWithNanosecondsSince1970(lastUsed);
  fields.tagData = QVTagDataOfNames(node.metadata.tags);
  fields.favoriteRank = node.metadata.favoriteRank;
  return std::make_shared<const QVQueryItem>(fileObjectID, std::move(fields));
}

NSData FakeDrive::tokenAtRank(std::uint64_t rank) const {
  return NSData::dataWithString(identity_ + std::to_string(rank));
}

std::optional<FakeDrive::WorkingSetBatch> FakeDrive::workingSet(const NSData &token,
                                                                std::uint64_t limit) const {
  std::uint64_t after = 0;
  if (token) {
    const std::string text(token.bytes().begin(), token.bytes().end());
    if (text.compare(0, identity_.size(), identity_) != 0) return std::nullopt;
    after = std::strtoull(text.c_str() + identity_.size(), nullptr, 10);
  }
  WorkingSetBatch batch;
  auto updated = byRank_.upper_bound(after);
  auto deleted = dead_.upper_bound(after);
  for (std::uint64_t taken = 0; taken < limit; ++taken) {
    const bool haveUpdate = updated != byRank_.end();
    const bool haveDeath = deleted != dead_.end();
    if (!haveUpdate && !haveDeath) break;
    if (haveUpdate && (!haveDeath || updated->first < deleted->first)) {
      after = updated->first;
      batch.updated.push_back(item((updated++)->second));
    } else {
      after = deleted->first;
      batch.deleted.push_back((deleted++)->second);
    }
  }
  batch.token = token && batch.updated.empty() && batch.deleted.empty() ? token : tokenAtRank(after);
  return batch;
}

}  // namespace droxa
