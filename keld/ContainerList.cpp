#include "keld/ContainerList.h"

#include <cerrno>
#include <cstring>
#include <map>
#include <set>
#include <sys/stat.h>

#include "keld/Placement.h"
#include "keld/SharedContainer.h"
#include "tessaly/QVContainer.h"

namespace droxa::keld {

namespace {

std::string plainName(const std::string &containerID, const std::map<std::string, std::string> &titles) {
  if (containerID == QVUbiquitousDocumentsContainerID) return "Documents";
  if (containerID == QVUbiquitousDesktopContainerID) return "Desktop";
  if (containerID == QVUbiquitousTrashContainerID) return ".Trash";
  if (const auto title = titles.find(containerID); title != titles.end()) return title->second;
  const std::string last = containerID.substr(containerID.rfind('.') + 1);
  return IsSharedContainer(containerID) ? SharedContainerTitle(last) : last;
}

std::vector<ContainerEntry> readEntries(ItemQueries &queries) {
  std::vector<ContainerEntry> entries;
  for (const ItemRecord &folder : queries.childrenByName(kReplicaFolder, ListingKey(), 100000)) {
    ContainerEntry entry;
    entry.containerID = folder.name;
    entry.folder = folder.id;
    const auto documents = queries.byName(folder.id, QVDocumentsFolderName(folder.name));
    if (documents && documents->isFolder()) entry.documents = documents->id;
    entries.push_back(std::move(entry));
  }
  return entries;
}

// A name that an entry of the root bears already, or a container before this one, gets the container's
// identifier.
void nameEntries(ItemQueries &queries, const std::map<std::string, std::string> &titles,
                 std::vector<ContainerEntry> &entries) {
  ItemNumber root = 0;
  for (const ContainerEntry &entry : entries)
    if (entry.containerID == QVUbiquitousDefaultContainerID) root = entry.documents;
  std::set<std::string> taken;
  for (ContainerEntry &entry : entries) {
    entry.shownName = plainName(entry.containerID, titles);
    const bool isListed = entry.containerID != QVUbiquitousDefaultContainerID &&
                          entry.containerID != QVUbiquitousTrashContainerID;
    if (!isListed) continue;
    const bool isTaken =
        taken.count(entry.shownName) != 0 || (root != 0 && queries.byName(root, entry.shownName));
    if (isTaken) entry.shownName += " (" + entry.containerID + ")";
    taken.insert(entry.shownName);
  }
}

}  // namespace

Containers::Containers(std::vector<ContainerEntry> entries) : entries_(std::move(entries)) {
  for (std::size_t index = 0; index < entries_.size(); ++index) {
    folders_[entries_[index].folder] = index;
    if (entries_[index].documents == 0) continue;
    byDocuments_[entries_[index].documents] = index;
    if (entries_[index].containerID == QVUbiquitousDefaultContainerID) root_ = entries_[index].documents;
  }
}

const ContainerEntry *Containers::byID(const std::string &containerID) const {
  for (const ContainerEntry &entry : entries_)
    if (entry.containerID == containerID) return &entry;
  return nullptr;
}

const ContainerEntry *Containers::byDocuments(ItemNumber documents) const {
  const auto found = byDocuments_.find(documents);
  return found == byDocuments_.end() ? nullptr : &entries_[found->second];
}

bool Containers::isListedInRoot(const ContainerEntry &entry) const {
  return entry.documents != 0 && entry.containerID != QVUbiquitousDefaultContainerID &&
         entry.containerID != QVUbiquitousTrashContainerID;
}

std::shared_ptr<const Containers> ContainerList::current() const {
  const Lock lock(mutex_);
  return current_;
}

void ContainerList::setTitle(const std::string &containerID, const std::string &title) {
  const Lock lock(mutex_);
  std::string &known = titles_[containerID];
  hasNewTitles_ = hasNewTitles_ || known != title;
  known = title;
}

bool ContainerList::hasNewTitles() const {
  const Lock lock(mutex_);
  return hasNewTitles_;
}

std::map<std::string, std::string> ContainerList::takeTitles() {
  const Lock lock(mutex_);
  hasNewTitles_ = false;
  return titles_;
}

ContainerList::Changes ContainerList::refresh(ItemQueries &queries, SqlDatabase &database) {
  std::vector<ContainerEntry> entries = readEntries(queries);
  nameEntries(queries, takeTitles(), entries);
  Changes changes;
  const auto before = current();
  if (before->entries() == entries) return changes;

  std::map<std::string, std::string> shownBefore;  // as it was last written down, maybe by an earlier run
  {
    SqlStatement read(database.handle(), "SELECT container, shown FROM containers");
    while (read.step()) shownBefore[std::string(read.bytes(0))] = read.bytes(1);
  }
  for (const ContainerEntry &entry : entries) {
    const ContainerEntry *old = before->byID(entry.containerID);
    if (!old || old->documents != entry.documents || old->folder != entry.folder) changes.list = true;
    const auto shown = shownBefore.find(entry.containerID);
    if (shown != shownBefore.end() && shown->second != entry.shownName && entry.documents != 0)
      changes.renamed.push_back(entry.documents);
  }
  if (before->entries().size() != entries.size()) changes.list = true;

  database.execute("DELETE FROM containers");
  SqlStatement write(database.handle(), "INSERT INTO containers VALUES (?, ?, ?)");
  for (const ContainerEntry &entry : entries)
    write.bindText(1, entry.containerID).bind(2, entry.documents).bindBlob(3, entry.shownName).run();
  const Lock lock(mutex_);
  current_ = std::make_shared<const Containers>(std::move(entries));
  return changes;
}

const std::vector<std::string> &BuiltInContainers() {
  static const std::vector<std::string> containers{
      QVUbiquitousDefaultContainerID, QVUbiquitousDocumentsContainerID, QVUbiquitousDesktopContainerID,
      QVUbiquitousTrashContainerID};
  return containers;
}

std::string MakeBuiltInContainers(const std::string &replicaPath) {
  for (const std::string &container : BuiltInContainers()) {
    const std::string folder = replicaPath + "/" + container;
    for (const std::string &path : {folder, folder + "/" + QVDocumentsFolderName(container)}) {
      if (::mkdir(path.c_str(), 0700) == 0 || errno == EEXIST) continue;
      return path + ": can't make the folder: " + std::strerror(errno);
    }
  }
  return {};
}

}  // namespace droxa::keld
