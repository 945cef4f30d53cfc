#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

#include "platform/cloudkit/embedded/Zone.h"

namespace droxa::embedded {

// What lies below what in a zone with shares: the live records and the names of their parents. A parent that
// isn't there, or a circle of parents, ends every way up. Thread contract: the connection's.
class Hierarchy {
 public:
  Hierarchy(const Connection &connection, std::int64_t zone) : connection_(connection), zone_(zone) {}

  // Reads it from the zone's records, which costs their number; and forgets it.
  void build() const;
  void drop() const;

  void put(const CKRecord &record) const;
  void remove(const std::string &record) const;

  // "": it has none. Absent: there is no such record.
  std::optional<std::string> parentOf(const std::string &record) const;
  bool isNamedAsParent(const std::string &record) const;
  // The record, its parent, and so on; empty when there is no such record.
  std::vector<std::string> wayUp(const std::string &record) const;
  // The record and all that lie below it, parents first; the record itself even if there is none any more.
  std::vector<std::string> below(const std::string &record) const;

 private:
  const Connection &connection_;
  const std::int64_t zone_;
};

// The parent that a record names; "" when it names none.
std::string ParentOf(const CKRecord &record);

}  // namespace droxa::embedded
