#include "platform/fileprovider/NSFileProviderItem.h"

namespace droxa {

// Neither page is 16 bytes long, so that no token of an enumerator is taken for one of them.

const NSData &NSFileProviderInitialPageSortedByName() {
  static const auto *page = new NSData(NSData::dataWithString("NSFileProviderInitialPageSortedByName"));
  return *page;
}

const NSData &NSFileProviderInitialPageSortedByDate() {
  static const auto *page = new NSData(NSData::dataWithString("NSFileProviderInitialPageSortedByDate"));
  return *page;
}

std::string NSFileProviderPlainItem::description() const {
  return "<NSFileProviderPlainItem: " + fields_.itemIdentifier + " \"" + fields_.filename + "\" in " +
         fields_.parentItemIdentifier + ", " + fields_.typeIdentifier + ", rank " +
         std::to_string(fields_.changeRank) + ">";
}

}  // namespace droxa
