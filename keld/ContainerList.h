#pragma once

#include <map>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "keld/ItemEdits.h"
#include "keld/ItemQueries.h"
#include "keld/ItemRecord.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVProtocol.h"

namespace droxa::keld {

struct ContainerEntry {
  std::string containerID;
  ItemNumber folder = 0;
  ItemNumber documents = 0;  // 0: it has no documents folder (yet)
  std::string shownName;     // of its documents folder, as the root lists it
  bool operator==(const ContainerEntry &) const = default;
};

// The containers at one moment.
// Thread contract: immutable.
class Containers {
 public:
  explicit Containers(std::vector<ContainerEntry> entries = {});
  const std::vector<ContainerEntry> &entries() const { return entries_; }
  const ContainerEntry *byID(const std::string &containerID) const;
  const ContainerEntry *byDocuments(ItemNumber documents) const;
  bool isContainerFolder(ItemNumber folder) const { return folders_.count(folder) != 0; }
  ItemNumber root() const {
    return root_;
  }  // the default container's documents folder; 0 while there is none
  // Whether the root lists the folder beside its own entries.
  bool isListedInRoot(const ContainerEntry &entry) const;

 private:
  const std::vector<ContainerEntry> entries_;
  std::unordered_map<ItemNumber, std::size_t> byDocuments_;
  std::unordered_map<ItemNumber, std::size_t> folders_;
  ItemNumber root_ = 0;
};

// Keeps the list of the containers as the item table has it, and the names under which the root shows them.
// Thread contract: current() and the titles on any thread, the rest on the keeper's.
class ContainerList {
 public:
  std::shared_ptr<const Containers> current() const;

  // What the documents folder of a container is to be called in the root, from the next refresh() on.
  void setTitle(const std::string &containerID, const std::string &title);
  bool hasNewTitles() const;

  struct Changes {
    bool list = false;                // containers came, went, or got a documents folder
    std::vector<ItemNumber> renamed;  // documents folders that the root shows under another name now
  };
  // Reads the list anew from the table, inside the keeper's transaction, and writes down the names shown.
  Changes refresh(ItemQueries &queries, SqlDatabase &database);

 private:
  std::map<std::string, std::string> takeTitles();

  mutable Mutex mutex_;
  std::map<std::string, std::string> titles_ GUARDED_BY(mutex_);  // by the containers' identifiers
  bool hasNewTitles_ GUARDED_BY(mutex_) = false;
  std::shared_ptr<const Containers> current_ GUARDED_BY(mutex_) = std::make_shared<const Containers>();
};

// The containers that every home has.
const std::vector<std::string> &BuiltInContainers();
// Makes the folders of the built-in containers where they are missing. "" or what went wrong.
std::string MakeBuiltInContainers(const std::string &replicaPath);

}  // namespace droxa::keld
