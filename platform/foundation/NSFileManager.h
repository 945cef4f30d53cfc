#pragma once

#include <memory>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

inline constexpr std::int64_t NSFeatureUnsupportedError = 3328;

// What a sync service's client library knows of documents whose contents may be elsewhere.
// Thread contract: any thread; evict() may block on the service's daemon.
class NSUbiquitousItemProviding {
 public:
  virtual ~NSUbiquitousItemProviding() = default;
  // Lets go of the local contents; an error when they must stay.
  virtual NSError evictItemAtURL(const NSURL &url) = 0;
  // Whether there is a document at `url` whose contents aren't here. Asks the file system alone.
  virtual bool isDataless(const NSURL &url) = 0;

  // Whether the item at `url` is shared with other people, in `value`; false with `error` (may be null) set
  // when that can't be told. May ask the service's daemon. Nothing is, unless the service says so.
  virtual bool isShared(const NSURL &url, bool *value, NSError *error);

  // The folder where work on the item at `url` may be prepared: on the same file system, unseen by others,
  // and there already. nil: beside the item, under a hidden name.
  virtual NSURL itemReplacementDirectoryForURL(const NSURL &url);
  // The person asked for the item at `url` to be deleted, with all below it; it is still there. Called under
  // the coordinated access for its deletion, so it must not wait for somebody who asks for another.
  virtual void willDeleteItemAtURL(const NSURL &url);
  // What is on the disk for the document at `url`: the url, unless another file stands for it.
  virtual NSURL physicalURLForURL(const NSURL &url);
  // Where a file that stands for a document of that name in `folder` would lie; folder/name: none does.
  virtual NSURL physicalURLForName(const NSURL &folder, const std::string &name);
};

// Thread contract: any thread.
class NSFileManager {
 public:
  static NSFileManager *defaultManager();

  // The sync service of this process; null: none. The library installs it.
  void setUbiquitousItemProvider(std::shared_ptr<NSUbiquitousItemProviding> provider);
  std::shared_ptr<NSUbiquitousItemProviding> ubiquitousItemProvider() const;

  // Whether the local contents were let go of; otherwise `error` (may be null) is set: the service's, or
  // NSFeatureUnsupportedError (NSCocoaErrorDomain) without a service. Blocks on the service's daemon.
  bool evictUbiquitousItemAtURL(const NSURL &url, NSError *error) const;

  NSFileManager();
  ~NSFileManager();

 private:
  struct State;
  const std::unique_ptr<State> state_;
};

}  // namespace droxa
