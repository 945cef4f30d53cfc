#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/cloudkit/CKShare.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVShareOperation.h"
#include "tessaly/QVShareOperationProtocol.h"

// What a process of this drive's does with the share of an item, as operations for an NSOperationQueue. They
// are shared objects, made by their class operations. What is nil goes to the daemon as it is: the error is
// the daemon's.

namespace droxa {

// The share of the item at `url`. QVErrorNoShare when it has none.
class QVShareCopyOperation final : public QVShareOperation<std::optional<CKShare>, NSURL, NSError> {
 public:
  static std::shared_ptr<QVShareCopyOperation> initWithURL(const NSURL &url);
  // The URL is nil unless the daemon has a reason to hand one out.
  void setRootShareCopyCompletionBlock(Completion completion) { setCompletion(std::move(completion)); }

 private:
  explicit QVShareCopyOperation(const NSURL &url);
  void ask() override;

  const NSURL url_;
};

// The URL by which others reach the item at `fileURL`: that of its share. QVErrorNoShare when it has none.
class QVShareCopyShareURLOperation final : public QVShareOperation<NSURL, NSError> {
 public:
  static std::shared_ptr<QVShareCopyShareURLOperation> initWithFileURL(
      const NSURL &fileURL, const std::optional<std::string> &documentType);
  void setCopyShareURLCompletionBlock(Completion completion) { setCompletion(std::move(completion)); }

 private:
  QVShareCopyShareURLOperation(const NSURL &fileURL, const std::optional<std::string> &documentType);
  void ask() override;
  void askForURL(const std::optional<CKShare> &share);

  const NSURL fileURL_;
  const std::optional<std::string> documentType_;
};

// Saves a share, new or changed; completes with the share as the cloud has it then. The share says which item
// it is of; the file's URL is for those who read errors.
class QVShareSaveOperation final : public QVShareOperation<std::optional<CKShare>, NSError> {
 public:
  static std::shared_ptr<QVShareSaveOperation> initWithShare(const std::optional<CKShare> &share,
                                                             const NSURL &fileURL);
  void setShareSaveCompletionBlock(Completion completion) { setCompletion(std::move(completion)); }

 private:
  QVShareSaveOperation(const std::optional<CKShare> &share, const NSURL &fileURL);
  void ask() override;

  const std::optional<CKShare> share_;
};

// Withdraws a share, or leaves it when it is another's.
class QVShareDestroyOperation final : public QVShareOperation<NSError> {
 public:
  static std::shared_ptr<QVShareDestroyOperation> initWithShare(const std::optional<CKShare> &share,
                                                                const NSURL &fileURL);
  void setShareDestroyCompletionBlock(Completion completion) { setCompletion(std::move(completion)); }

 private:
  QVShareDestroyOperation(const std::optional<CKShare> &share, const NSURL &fileURL);
  void ask() override;

  const std::optional<CKShare> share_;
};

// The tokens by which a collaboration service knows the item at `url`: the share's (nil when there is none)
// and the item's own.
class QVSharingCopyShareTokenOperation final
    : public QVShareOperation<std::optional<std::string>, std::optional<std::string>, NSError> {
 public:
  static std::shared_ptr<QVSharingCopyShareTokenOperation> initWithURL(const NSURL &url);
  void setShareAndBaseTokenCompletionBlock(Completion completion) { setCompletion(std::move(completion)); }

 private:
  explicit QVSharingCopyShareTokenOperation(const NSURL &url);
  void ask() override;

  const NSURL url_;
};

// A new share of the item at `url`, which nobody knows before it is saved; nullopt with `error` (may be null)
// set. Blocks on the daemon. Any thread.
std::optional<CKShare> QVSharingCreateShareForItemAtURL(const NSURL &url, NSError *error);

}  // namespace droxa
