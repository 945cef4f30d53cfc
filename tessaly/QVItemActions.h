#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/foundation/NSDate.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSFileManager.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVContainer.h"

// What the Tessaly library does to the files of the drive on behalf of its user. Any thread; each may block
// on the file system and on the daemon. Errors are stored in `error`, which may be null.

namespace droxa {

class QVItemActions {
 public:
  virtual ~QVItemActions() = default;
  virtual bool trashItemAtURL(const NSURL &url, NSURL *resultingURL, NSError *error) = 0;
  virtual NSURL putBackURLForTrashedItemAtURL(const NSURL &url, NSError *error) = 0;
  virtual NSURL physicalURL(const NSURL &url) = 0;
  virtual void setLastOpenDate(const NSDate &date, const NSURL &url) = 0;
  virtual void setFavoriteRank(const std::optional<std::uint64_t> &rank, const NSURL &url) = 0;
  virtual bool setTagNames(const NSURL &url, const std::vector<std::string> &names, NSError *error) = 0;

  // Those of this process: the real ones, unless a test has put others in their place (null: the real ones
  // again).
  static std::shared_ptr<QVItemActions> shared();
  static void setSharedForTesting(std::shared_ptr<QVItemActions> actions);
};

// The real ones.
std::shared_ptr<QVItemActions> QVMakeItemActions();

// Moves the item into the store's trash, under a name that is free there, and notes where it came from. The
// caller holds the coordination. The resulting URL is nil when false is given.
bool qv_trashItemAtURL(const NSFileManager *manager, const NSURL &url, NSURL *resultingURL, NSError *error);
// Where a trashed item was before: in the folder that held it, wherever that is now. nil when nobody noted
// it, or when the item isn't in the trash.
NSURL qv_putBackURLForTrashedItemAtURL(const NSFileManager *manager, const NSURL &url, NSError *error);
// The container that holds the URL; null when none does.
std::shared_ptr<const QVContainer> qv_tessalyContainer(const NSURL &url);
// What is on the disk for the document at `url`: the URL itself, or the promise file that stands for a
// document which isn't here.
NSURL qv_physicalURL(const NSURL &url);
// A nil date, or no rank, removes what was set. Of a symbolic link, the link's own.
void qv_setLastOpenDate(const NSFileManager *manager, const NSDate &date, const NSURL &url);
void qv_setFavoriteRank(const NSFileManager *manager, const std::optional<std::uint64_t> &rank,
                        const NSURL &url);
// Replaces the file's tags, which file managers keep as "user.xdg.tags".
bool qv_setTagNames(const NSURL &url, const std::vector<std::string> &names, NSError *error);

}  // namespace droxa
