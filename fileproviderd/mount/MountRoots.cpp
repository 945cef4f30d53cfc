#include "fileproviderd/mount/MountRoots.h"

#include <atomic>
#include <filesystem>
#include <vector>

namespace droxa {

namespace fs = std::filesystem;

namespace {

constexpr char kTrashContainer[] = "com.quorva.Tessaly.trash";
constexpr char kTrashDocuments[] = "files";
constexpr char kTrashNotes[] = "info";

}  // namespace

// One time of asking. Thread contract: the counters are atomic; the rest under its lock.
struct MountRoots::Round {
  std::function<void(bool)> done;
  std::atomic<std::size_t> left{1};
  std::atomic<bool> isWhole{true};
  std::string root;  // before the first container is asked for
  Mutex lock;
  std::map<std::string, std::string> folders GUARDED_BY(lock);
};

MountRoots::MountRoots(std::shared_ptr<ExtensionCalls> calls, std::string replica, std::string trashName)
    : calls_(std::move(calls)), replica_(std::move(replica)), trashName_(std::move(trashName)) {}

void MountRoots::refresh(std::function<void(bool)> done) {
  auto round = std::make_shared<Round>();
  round->done = std::move(done);
  calls_->URLForItemIdentifier(NSFileProviderRootContainerItemIdentifier,
                               [self = shared_from_this(), round](const NSURL &url, const NSError &error) {
                                 if (!url || error) {
                                   round->done(false);
                                   return;
                                 }
                                 round->root = url.path();
                                 self->askForContainers(round);
                               });
}

void MountRoots::askForContainers(const std::shared_ptr<Round> &round) {
  // File managers would make a folder of their own if there were none to throw things into.
  const fs::path trash = fs::path(replica_) / kTrashContainer;
  std::error_code refused;
  fs::create_directories(trash / kTrashDocuments, refused);
  fs::create_directories(trash / kTrashNotes, refused);
  const std::string documents = fs::path(round->root).filename().native();
  std::vector<std::string> asked;
  std::error_code problem;
  for (auto entry = fs::directory_iterator(replica_, problem); !problem && entry != fs::directory_iterator();
       entry.increment(problem)) {
    if (entry->path().filename().native().starts_with('.')) continue;
    std::error_code ignored;
    const std::string path = (entry->path() / documents).native();
    if (fs::is_directory(entry->path() / kTrashDocuments, ignored)) {
      const Lock held(round->lock);
      round->folders[trashName_] = entry->path().native();
    } else if (path != round->root && fs::is_directory(path, ignored)) {
      asked.push_back(path);
    }
  }
  round->left += asked.size();
  for (const std::string &path : asked) askForContainer(round, path);
  end(round);
}

void MountRoots::askForContainer(const std::shared_ptr<Round> &round, const std::string &path) {
  const auto self = shared_from_this();
  calls_->identifierForItemAtURL(
      NSURL::fileURLWithPath(path),
      [self, round, path](const std::optional<std::string> &identifier, const NSError &error) {
        if (!identifier) {
          if (error) round->isWhole = false;
          return self->end(round);
        }
        self->calls_->itemForIdentifier(*identifier, [self, round, path](const auto &item, const NSError &) {
          if (item) {
            const Lock held(round->lock);
            round->folders[item->fields().filename] = path;
          } else {
            round->isWhole = false;
          }
          self->end(round);
        });
      });
}

void MountRoots::end(const std::shared_ptr<Round> &round) {
  if (--round->left != 0) return;
  std::map<std::string, std::string> folders;
  {
    const Lock held(round->lock);
    folders = round->folders;
  }
  {
    const Lock held(lock_);
    root_ = round->root;
    if (round->isWhole) folders_.clear();
    for (const auto &[name, path] : folders) folders_[name] = path;
  }
  round->done(round->isWhole);
}

std::string MountRoots::root() const {
  const Lock held(lock_);
  return root_;
}

std::optional<std::string> MountRoots::folderNamed(const std::string &name) const {
  const Lock held(lock_);
  const auto found = folders_.find(name);
  return found == folders_.end() ? std::nullopt : std::optional(found->second);
}

std::map<std::string, std::string> MountRoots::folders() const {
  const Lock held(lock_);
  return folders_;
}

}  // namespace droxa
