#include "cli/PageReader.h"

namespace droxa {

PageReader::PageReader(ControlClient &client, ControlClient::Enumerator enumerator, NSData firstPage)
    : client_(client), enumerator_(std::move(enumerator)), next_(std::move(firstPage)) {}

CallResult<NSFileProviderItems> PageReader::nextPage() {
  if (isAtEnd_) return {};
  auto page = client_.page(enumerator_, next_);
  next_ = page.value.next;
  isAtEnd_ = page.error || !next_;
  return {std::move(page.value.items), page.error};
}

CallResult<ControlClient::Item> PageReader::nextItem() {
  while (position_ == page_.size()) {
    if (isAtEnd_) return {};
    auto page = nextPage();
    if (page.error) return {nullptr, page.error};
    page_ = std::move(page.value);
    position_ = 0;
  }
  return {page_[position_++], NSError()};
}

}  // namespace droxa
