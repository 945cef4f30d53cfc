// Changing what a user notes about an item: when it was last used, its tags, its rank among the favourites.
// All of it is done before the call returns.

#include <utility>
#include <vector>

#include "additions/NSError+QVFPAdditions.h"
#include "additions/QVLogSection.h"
#include "extension/QVFileProviderExtension.h"
#include "platform/fileprovider/FPTags.h"
#include "tessaly/QVItemActions.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVQueryItem.h"

namespace droxa {
namespace {

std::vector<std::string> LabelsOfTags(const NSData &tagData) {
  std::vector<std::string> labels;
  for (FPTag &tag : FPGetTagsFromTagsData(tagData)) labels.push_back(std::move(tag.label));
  return labels;
}

}  // namespace

// Of an unknown item it is the last step of each that fails: the URL isn't looked at before.

void QVFileProviderExtension::setLastUsedDate(const NSDate &date, const std::string &identifier,
                                              NSFileProviderItemCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx set last used date %@ for %@", section.tag(), date,
               identifier);
  const NSURL url = _URLForItemWithPersistentIdentifier(identifier, false);
  qv_setLastOpenDate(NSFileManager::defaultManager(), date, url);
  completeWithNewItem(url, completion);
}

void QVFileProviderExtension::setFavoriteRank(const std::optional<std::uint64_t> &rank,
                                              const std::string &identifier,
                                              NSFileProviderItemCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx set favorite rank %@ for %@", section.tag(),
               rank ? std::optional(std::to_string(*rank)) : std::nullopt, identifier);
  const NSURL url = _URLForItemWithPersistentIdentifier(identifier, false, true);
  qv_setFavoriteRank(NSFileManager::defaultManager(), rank, url);
  completeWithNewItem(url, completion);
}

// Tags are those of an alias's target, unlike the two others.
void QVFileProviderExtension::setTagData(const NSData &tagData, const std::string &identifier,
                                         NSFileProviderItemCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx set tag data (%lu bytes) for %@", section.tag(),
               tagData.length(), identifier);
  const std::vector<std::string> labels = LabelsOfTags(tagData);
  const NSURL url = _URLForItemWithPersistentIdentifier(identifier, true, true);
  NSError error;
  if (qv_setTagNames(url, labels, &error)) return completeWithNewItem(url, completion);
  os_log_error(qvc_default_log(), "[ERROR] can't set tags for %@; %@", url, error);
  // Only here may there be no completion.
  if (completion) completion(nullptr, qv_fileProviderError(error));
}

}  // namespace droxa
