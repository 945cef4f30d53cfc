#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "keld/ItemPresenter.h"
#include "keld/ItemQueries.h"
#include "platform/foundation/NSData.h"
#include "tessaly/QVFileObjectID.h"

namespace droxa::keld {

// A working-set token: "QVWS", the database's UUID as text, and two numbers of 8 bytes, the lowest first.
struct WorkingSetToken {
  std::string databaseUUID;
  std::uint64_t rank = 0;  // up to which the feed was read
  std::uint64_t deadUpTo =
      0;  // the reader began after these deaths, so that it doesn't miss them when forgotten

  NSData data() const;
  static std::optional<WorkingSetToken> parse(const NSData &data);
};

struct WorkingSetBatch {
  bool isExpired = false;  // the token isn't of this database, or deaths since then are forgotten
  QVQueryItems updated;
  std::vector<QVFileObjectID> deleted;
  NSData token;
};

// What changed since `token` (nil: ever), oldest first, at most `limit` of both kinds together.
// REQUIRES: one read transaction. Throws SqlError.
WorkingSetBatch ReadWorkingSet(ItemQueries &queries, const ItemPresenter &presenter, const NSData &token,
                               std::uint64_t limit);

}  // namespace droxa::keld
