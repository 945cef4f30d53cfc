#include "additions/NSString+FennickAdditions.h"
#include "platform/oslog/LogFormat.h"

namespace droxa {

std::string qv_stringWithSize(CGSize size) {
  return NSStringWithFormat("{%.2f, %.2f}", size.width, size.height);
}

}  // namespace droxa
