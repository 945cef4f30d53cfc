#include "keld/contents/OutgoingDocument.h"

#include <cerrno>
#include <fcntl.h>

#include "keld/contents/FileSteps.h"

namespace droxa::keld {

ContentsResult OutgoingDocument::open(int folder, const std::string &name, const Watch &watch,
                                      std::optional<OutgoingDocument> *document) {
  OwnedDescriptor file = OpenFileIn(folder, name, O_RDONLY);
  if (file) return OutgoingDocument::watch(std::move(file), watch, document);
  switch (errno) {
    case ENOENT:
    case ENOTDIR:
      return ContentsResult::failed(ContentsOutcome::gone, errno);
    case ELOOP:
    case ENXIO:
      return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
    case EWOULDBLOCK:
    case ETXTBSY:
      return ContentsResult::failed(ContentsOutcome::inUse, errno);
    default:
      return ContentsResult::failedWith(errno);
  }
}

// The lease comes first: what is looked at then can't change unnoticed any more.
ContentsResult OutgoingDocument::watch(OwnedDescriptor file, const Watch &watch,
                                       std::optional<OutgoingDocument> *document) {
  const auto kind = ReadFolderFacts(file.get(), watch.ownDevice);
  if (!kind || kind->kind != NSFileProviderItemKind::document)
    return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  auto lease = FileLease::take(file.get(), watch.against, watch.useLeases);
  if (!lease) return ContentsResult::failed(ContentsOutcome::inUse);
  const DocumentLook look = ClassifyOpenDocument(file.get(), watch.ownDevice);
  if (look.kind == DocumentClass::unreadable) return ContentsResult::failedWith(look.error);
  document->emplace(OutgoingDocument(std::move(file), std::move(*lease), look, watch.ownDevice));
  return {};
}

bool OutgoingDocument::hasChanged() const {
  const DocumentLook now = ClassifyOpenDocument(file_.get(), ownDevice_);
  if (isDataless()) return now.kind != DocumentClass::dataless;
  return now.facts.size != facts().size || now.facts.modified != facts().modified;
}

ContentsResult OutgoingDocument::touchedResult() const {
  return ContentsResult::failed(hasChanged() ? ContentsOutcome::changedMeanwhile : ContentsOutcome::inUse);
}

bool OutgoingDocument::isAt(int folder, const std::string &name) const {
  const auto there = ReadFileFacts(folder, name, ownDevice_);
  return there && there->inode == facts().inode && there->device == facts().device;
}

bool IsAsExpected(const FileFacts &facts, const FileFacts &expected) {
  return facts.inode == expected.inode && facts.size == expected.size &&
         facts.modified == expected.modified && (expected.changed == 0 || facts.changed == expected.changed);
}

}  // namespace droxa::keld
