#include "fileproviderd/mount/Invalidation.h"

#include <cerrno>
#include <chrono>

#include "fileproviderd/mount/HiddenNames.h"

namespace droxa {

Invalidation::Invalidation(std::shared_ptr<MountedDrive> drive, std::shared_ptr<KernelNotices> notices)
    : drive_(std::move(drive)), notices_(std::move(notices)) {}

void Invalidation::start() {
  thread_ = std::thread([this] { run(); });
}

void Invalidation::stop() {
  {
    const Lock held(lock_);
    isStopped_ = true;
  }
  changed_.notify_all();
  if (thread_.joinable()) thread_.join();
}

void Invalidation::seen(NodeId folder, const std::string &name, bool isNew) {
  {
    const Lock held(lock_);
    const auto [waiting, isFirst] = waiting_.try_emplace({folder, name}, isNew);
    waiting->second = waiting->second || isNew;
    if (!isFirst) return;
    names_.emplace_back(folder, name);
  }
  changed_.notify_all();
}

void Invalidation::missed() {
  {
    const Lock held(lock_);
    isEverything_ = true;
  }
  changed_.notify_all();
}

void Invalidation::contentsChanged(NodeId node) {
  {
    const Lock held(lock_);
    contents_.insert(node);
  }
  changed_.notify_all();
}

void Invalidation::run() {
  for (;;) {
    Name name;
    bool isNew = false;
    std::set<NodeId> contents;
    bool isEverything = false;
    {
      Lock held(lock_);
      while (!isStopped_ && names_.empty() && contents_.empty() && !isEverything_) changed_.wait(held);
      if (isStopped_) return;
      contents.swap(contents_);
      isEverything = std::exchange(isEverything_, false);
      if (!names_.empty()) {
        name = std::move(names_.front());
        names_.pop_front();
        isNew = waiting_.extract(name).mapped();
      }
    }
    for (const NodeId node : contents) notices_->contentsChanged(node);
    if (isEverything) compareEverything();
    if (name.first != 0) compare(name, isNew);
  }
}

void Invalidation::compare(const Name &name, bool isNew) {
  const auto &[folder, child] = name;
  if (child.empty()) return compareFolder(folder);
  if (isHiddenName(child)) return;
  const NodeId node = drive_->nodes.find(folder, child);
  // What is being done through the mount is looked at when it is done.
  if (drive_->busy.contains(folder, child) || (node != 0 && drive_->nodes.isBeingChanged(node))) {
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
    return seen(folder, child, isNew);
  }
  struct stat now;
  const int error = drive_->look(folder, child, &now);
  if (error == 0 && node != 0) return differs(folder, child, node, now);
  // A file that the kernel doesn't know, and that was there before, is nothing to it when it changes.
  if (error == 0 && !isNew) return;
  if (error == 0) return notices_->appeared(folder, child, now);
  if (error != ENOENT || node == 0) return;
  const auto view = drive_->nodes.view(node);
  drive_->nodes.removed(folder, child, false);
  notices_->disappeared(folder, child, node, view ? view->type : S_IFREG);
}

void Invalidation::differs(NodeId folder, const std::string &name, NodeId node, const struct stat &now) {
  const auto before = drive_->nodes.view(node);
  if (!before) return;
  const FileStamp stamp = FileStamp::of(now);
  if (before->told == stamp && before->type == (now.st_mode & S_IFMT)) return;
  const auto hasChanged = drive_->nodes.see(node, now);
  if (!hasChanged) {
    drive_->nodes.removed(folder, name, false);
    notices_->disappeared(folder, name, node, before->type);
    notices_->appeared(folder, name, now);
  } else if (*hasChanged) {
    notices_->contentsChanged(node);
  } else {
    notices_->attributesChanged(node, !hasMuchToDo());
  }
}

// Watchers aren't told of the attributes of thousands of files that come one after the other.
bool Invalidation::hasMuchToDo() {
  constexpr std::size_t kMuch = 500;
  const Lock held(lock_);
  return names_.size() > kMuch;
}

void Invalidation::compareFolder(NodeId folder) {
  const auto view = drive_->nodes.view(folder);
  if (view && view->parent != 0) return compare({view->parent, view->name}, false);
  if (view) notices_->attributesChanged(folder, true);
}

void Invalidation::compareEverything() {
  for (const NodeId node : drive_->nodes.all()) {
    const auto view = drive_->nodes.view(node);
    if (!view) continue;
    if (S_ISDIR(view->type)) notices_->listingChanged(node);
    if (view->parent != 0) compare({view->parent, view->name}, false);
  }
}

}  // namespace droxa
