#pragma once

#include <optional>
#include <string>

#include "keld/FolderReading.h"
#include "keld/contents/ContentsResult.h"
#include "keld/contents/DocumentClass.h"
#include "keld/contents/FileLease.h"

namespace droxa::keld {

// A document whose contents are about to leave its name: held open and watched, so that what somebody writes
// into it meanwhile isn't taken for what was there. Thread contract: used by one thread at a time.
class OutgoingDocument {
 public:
  struct Watch {
    FileLease::Against against = FileLease::Against::writers;
    bool useLeases = true;
    std::uint64_t ownDevice = 0;
  };

  // done; gone; changedMeanwhile when no regular file is there; inUse; error.
  static ContentsResult open(int folder, const std::string &name, const Watch &watch,
                             std::optional<OutgoingDocument> *document);
  // The same of a file that is open already.
  static ContentsResult watch(OwnedDescriptor file, const Watch &watch,
                              std::optional<OutgoingDocument> *document);

  int descriptor() const { return file_.get(); }
  const FileFacts &facts() const { return look_.facts; }  // when it was opened
  DocumentClass kind() const { return look_.kind; }
  const std::optional<DocumentMarker> &marker() const { return look_.marker; }
  bool isDataless() const { return kind() == DocumentClass::dataless; }

  // Whether nobody has opened it, or changed size and modification time, since it was opened. A placeholder
  // may be touched as long as nothing is in it.
  bool isUntouched() const { return !hasChanged() && lease_->isUnbroken(); }
  bool hasChanged() const;
  // What to answer when it isn't untouched: changedMeanwhile or inUse.
  ContentsResult touchedResult() const;
  bool isAt(int folder, const std::string &name) const;
  void release() { lease_->release(); }

 private:
  OutgoingDocument(OwnedDescriptor file, FileLease lease, const DocumentLook &look, std::uint64_t ownDevice)
      : file_(std::move(file)), lease_(std::move(lease)), look_(look), ownDevice_(ownDevice) {}

  OwnedDescriptor file_;
  std::optional<FileLease> lease_;  // always there; it can't be assigned
  DocumentLook look_;
  std::uint64_t ownDevice_;
};

// Whether the file is the one that was last seen: inode, size, modification time, and time of change unless
// it isn't known (0).
bool IsAsExpected(const FileFacts &facts, const FileFacts &expected);

}  // namespace droxa::keld
