// What the cloud has no more.

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <unistd.h>

#include "keld/sync/CloudApplier.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

void CloudApplier::remove(const std::string &record) {
  context_.store.dropOrphan(record);
  const auto row = context_.store.byRecord(record);
  if (!row) return;
  ++applied_;
  if (context_.scope.isShared()) context_.store.dropTop(record);
  // What has left for another zone is that one's.
  const bool isHere = row->item != 0 && context_.files.item(row->item);
  const auto location = isHere ? context_.files.locate(row->item, nullptr) : std::nullopt;
  if (!location && isHere) {
    touch(context_.files.pathOf(row->item));
    return context_.store.fetchAgain(record);
  }
  if (!location) {
    if (row->item != 0) context_.store.dropQueued(row->item);
    // Made a moment ago, and not seen by the keeper yet.
    const auto path = row->item == 0 ? context_.files.path(*row) : std::nullopt;
    int code = 0;
    if (path) {
      FileLocation there;
      there.path = *path;
      there.name = row->name;
      there.folder = context_.files.openFolder(path->substr(0, path->size() - row->name.size() - 1), &code);
      const auto marker = there ? ReadMarker(there.folder.get(), there.name) : std::nullopt;
      if (marker && marker->recordName == record) {
        if (row->kind == NSFileProviderItemKind::folder) {
          foldersToRemove_.push_back(record);
          return;
        }
        return removeDocument(*row, there);
      }
    }
    context_.store.erase(record);
    return;
  }
  if (row->kind == NSFileProviderItemKind::folder)
    foldersToRemove_.push_back(record);
  else
    removeDocument(*row, *location);
}

void CloudApplier::removeDocument(const SyncRow &row, const FileLocation &location) {
  const auto facts = ReadFileFacts(location.folder.get(), location.name, 0);
  const bool isLink = facts && (IsLink(facts->kind));
  bool isUnchanged = isLink || !facts;
  if (row.kind == NSFileProviderItemKind::document) {
    const DocumentLook look = context_.storage.classify(location.folder.get(), location.name);
    const bool isIntact = look.kind == DocumentClass::present || look.kind == DocumentClass::dataless ||
                          look.kind == DocumentClass::evicting;
    isUnchanged = (isIntact && look.marker && look.marker->recordName == row.record) ||
                  (look.kind == DocumentClass::plain && IsSameContents(LocalFileOf(look.facts), row.local));
  }
  context_.store.erase(row.record);
  if (!isUnchanged && context_.scope.isShared() && row.parent == context_.scope.top()) {
    if (row.item != 0) context_.store.dropQueued(row.item);
    return keepAside(location.path);
  }
  if (!isUnchanged) {
    // Deleted elsewhere, and written here since: it lives, as a document of its own.
    if (row.item != 0) context_.store.enqueue(row.item, false, false);
    os_log(qvc_default_log(), "[WARNING] %s was deleted elsewhere, but changed here: it is kept",
           location.path);
    return;
  }
  ::unlinkat(location.folder.get(), location.name.c_str(), 0);
  touch(location.path);
}

// The deepest first. One that still holds something was given contents here meanwhile: it lives.
void CloudApplier::removeFolders() {
  struct Doomed {
    std::string record;
    std::string path;
  };
  std::vector<Doomed> doomed;
  for (const std::string &record : std::exchange(foldersToRemove_, {})) {
    const auto row = context_.store.byRecord(record);
    const auto path = row ? context_.files.path(*row) : std::nullopt;
    if (path)
      doomed.push_back({record, *path});
    else
      context_.store.erase(record);
  }
  std::sort(doomed.begin(), doomed.end(),
            [](const Doomed &a, const Doomed &b) { return a.path.size() > b.path.size(); });
  std::set<std::string> records;
  for (const Doomed &folder : doomed) records.insert(folder.record);
  for (const Doomed &folder : doomed) {
    const auto row = context_.store.byRecord(folder.record);
    if (context_.scope.isShared()) hangChildren(folder.record, records);
    const int result = ::rmdir(context_.files.absolute(folder.path).c_str());
    const bool isGone = result == 0 || errno == ENOENT;
    context_.store.erase(folder.record);
    touch(folder.path);
    if (isGone || !row) continue;
    if (context_.scope.isShared() && row->parent == context_.scope.top()) {
      keepAside(folder.path);
      continue;
    }
    if (row->item == 0) continue;
    // It gets a record of its own, which what is left in it has to be told.
    context_.store.enqueue(row->item, false, false);
    for (const SyncRow &child : context_.store.childrenOf(folder.record, UINT32_MAX))
      if (child.item != 0) context_.store.enqueue(child.item, false, false);
  }
}

}  // namespace droxa::keld
