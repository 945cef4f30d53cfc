#include "additions/QVLogSection.h"

#include "platform/dispatch/dispatch.h"
#include "tessaly/QVLog.h"

namespace droxa {
namespace {

// Never released: sections are still opened while a process ends.
const dispatch_queue_t &CreateLogSectionQueue() {
  static const dispatch_queue_t &queue = *new dispatch_queue_t(dispatch_queue_create(
      "create-log-section", dispatch_queue_attr_make_with_autorelease_frequency(
                                DISPATCH_QUEUE_SERIAL, DISPATCH_AUTORELEASE_FREQUENCY_WORK_ITEM)));
  return queue;
}

std::uint64_t lastTag = 0;  // touched on the queue above only

constexpr bool IsInformationTag(std::uint64_t tag) {
  return tag % 2 == 0;
}

}  // namespace

std::uint64_t QVLogSectionCreate(bool isInformation) {
  std::uint64_t tag = 0;
  dispatch_sync(CreateLogSectionQueue(), [&tag, isInformation] {
    ++lastTag;
    if (IsInformationTag(lastTag) != isInformation) ++lastTag;
    tag = lastTag;
  });
  return tag;
}

void QVLogSectionEnd(std::uint64_t tag) {
  if (tag == 0) return;
  if (IsInformationTag(tag)) {
    os_log_info(qvc_default_log(), "[INFO] ┗%llx ", tag);
  } else {
    os_log_debug(qvc_default_log(), "[DEBUG] ┗%llx ", tag);
  }
}

}  // namespace droxa
