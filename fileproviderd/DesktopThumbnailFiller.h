#pragma once

#include <chrono>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "fileproviderd/ExtensionCalls.h"
#include "platform/dispatch/dispatch.h"
#include "platform/foundation/ThreadSafety.h"
#include "platform/imaging/DesktopThumbnails.h"

namespace droxa {

// Below what path programs see what lies below a path of the replica.
struct ShownFolder {
  std::string replica;
  std::string shown;
};

// Puts thumbnails of documents that aren't here into the desktop's cache, so that whoever shows a folder of
// the drive finds pictures without reading, and so fetching, the documents. What somebody lists is what
// somebody looks at: those documents are taken, page by page, and one page after the other. What has a valid
// thumbnail is left alone, what has none isn't asked for again for a minute: it may be made yet.
//
// The pictures come from the cloud, which others may write: only PNG files are decoded, by a library that
// does nothing else, and none that is large (PNGImage).
// Thread contract: any thread. The work is done on one queue, which waits for the extension; completions run
// on it.
class DesktopThumbnailFiller final : public std::enable_shared_from_this<DesktopThumbnailFiller> {
 public:
  DesktopThumbnailFiller(std::shared_ptr<ExtensionCalls> calls, DesktopThumbnails cache,
                         std::vector<ShownFolder> folders);

  // From now on what lies in the replica is seen there too: a mount's folder, say.
  void addShownFolder(const ShownFolder &folder);

  // A client was given these items of the container. Returns at once; when it can't keep up, what comes is
  // left out.
  void itemsWereListed(const std::string &container, const NSFileProviderItems &items);
  // Does the same for all that is in the container; completes when it is done: nil, or why it isn't.
  void fillContainer(const std::string &container, NSFileProviderErrorCompletion completion);

 private:
  // A document that has no valid thumbnail, and all the paths that it is seen at.
  struct Wanted {
    std::string identifier;
    std::vector<DesktopThumbnailSubject> subjects;
    std::pair<std::string, std::int64_t> state() const {
      return {identifier, subjects.empty() ? 0 : subjects.front().modifiedSeconds};
    }
  };

  // Of documents that had none a moment ago, too?
  enum class Again : bool { no, yes };
  NSError fill(const std::string &container, const NSFileProviderItems &items, Again again);
  bool hadNone(const Wanted &document) const;
  NSError list(const std::string &container, NSFileProviderItems *items) const;
  NSError locate(const std::string &container, std::string *path) const;
  Wanted wanted(const std::string &folder, const NSFileProviderItemFields &item);
  NSError fetch(const std::vector<Wanted> &documents);
  NSError store(const Wanted &document, const FPDThumbnail &thumbnail);  // why it can't be kept

  const std::shared_ptr<ExtensionCalls> calls_;
  const DesktopThumbnails cache_;
  const dispatch_queue_t queue_;

  // Touched on the queue alone: documents, in a state, that had no thumbnail, and when that was.
  std::map<std::pair<std::string, std::int64_t>, std::chrono::steady_clock::time_point> without_;

  Mutex lock_;  // held for no call
  std::vector<ShownFolder> folders_ GUARDED_BY(lock_);
  std::size_t waiting_ GUARDED_BY(lock_) = 0;  // items that were listed and not looked at yet
};

}  // namespace droxa
