#pragma once

#include <optional>
#include <string>

#include "platform/cloudkit/CKCloud.h"

namespace droxa::embedded {

// What a share token says, before and after it was sealed with the cloud's key. Thread contract: a value.
struct ShareToken {
  CKShareTokenKind kind = CKShareTokenKind::base;
  UUID cloud;
  std::int64_t zone = 0;
  std::int64_t account = 0;  // that it was given to
  std::string record;
  std::string share;  // the share's record; "" when the record is in none, and of a base token

  // Hexadecimal digits of the contents and of their HMAC-SHA256.
  std::string sealed(const std::string &key) const;
  // Absent unless sealed() with that key made the text.
  static std::optional<ShareToken> open(const std::string &text, const std::string &key);
  bool operator==(const ShareToken &) const = default;
};

}  // namespace droxa::embedded
