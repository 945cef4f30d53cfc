#pragma once

#include <cstddef>
#include <memory>
#include <string>

#include "cli/ControlClient.h"

namespace droxa {

// Reads a container's listing page by page: the next page is asked for when the one before was taken.
// Thread contract: one thread.
class PageReader {
 public:
  PageReader(ControlClient &client, ControlClient::Enumerator enumerator, NSData firstPage);
  // The next page, in the container's order; empty and `isAtEnd()` after the last.
  CallResult<NSFileProviderItems> nextPage();
  // The next item, null at the end.
  CallResult<ControlClient::Item> nextItem();
  bool isAtEnd() const { return isAtEnd_; }

 private:
  ControlClient &client_;
  const ControlClient::Enumerator enumerator_;
  NSData next_;
  bool isAtEnd_ = false;
  NSFileProviderItems page_;
  std::size_t position_ = 0;
};

}  // namespace droxa
