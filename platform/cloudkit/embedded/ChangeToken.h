#pragma once

#include <cstdint>
#include <optional>

#include "platform/cloudkit/CKCloud.h"

namespace droxa::embedded {

// What a change token says: the cloud, the zone's number in it (a zone that is made anew gets another one)
// and the last change that was told. Thread contract: a value.
struct ChangeToken {
  UUID cloud;
  std::int64_t zone = 0;
  std::int64_t seq = 0;

  CKServerChangeToken encoded() const;
  static std::optional<ChangeToken> decode(const CKServerChangeToken &token);
};

}  // namespace droxa::embedded
