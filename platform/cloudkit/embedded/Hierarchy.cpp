#include "platform/cloudkit/embedded/Hierarchy.h"

#include <set>

#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {

std::string ParentOf(const CKRecord &record) {
  const auto *parent = record.get<std::string>(CKRecordParentKey);
  return parent ? *parent : std::string();
}

void Hierarchy::build() const {
  drop();
  static const std::set<std::string> keys{CKRecordParentKey};
  SqlUse row = connection_.use("SELECT " DROXA_RECORD_COLUMNS
                               " FROM records WHERE zone = ? AND NOT deleted AND type <> ?");
  row.bind(zone_).bind(CKRecordTypeShare);
  while (row.step()) put(ReadRecord(row, {}, keys));
}

void Hierarchy::drop() const {
  connection_.use("DELETE FROM hierarchy WHERE zone = ?").bind(zone_).run();
}

void Hierarchy::put(const CKRecord &record) const {
  connection_.use("INSERT OR REPLACE INTO hierarchy (zone, record, parent) VALUES (?, ?, ?)")
      .bind(zone_)
      .bind(record.recordID.recordName)
      .bind(ParentOf(record))
      .run();
}

void Hierarchy::remove(const std::string &record) const {
  connection_.use("DELETE FROM hierarchy WHERE zone = ? AND record = ?").bind(zone_).bind(record).run();
}

std::optional<std::string> Hierarchy::parentOf(const std::string &record) const {
  SqlUse row = connection_.use("SELECT parent FROM hierarchy WHERE zone = ? AND record = ?");
  if (!row.bind(zone_).bind(record).step()) return std::nullopt;
  return row.text(0);
}

bool Hierarchy::isNamedAsParent(const std::string &record) const {
  SqlUse row = connection_.use("SELECT 1 FROM hierarchy WHERE zone = ? AND parent = ? LIMIT 1");
  return row.bind(zone_).bind(record).step();
}

std::vector<std::string> Hierarchy::wayUp(const std::string &record) const {
  std::vector<std::string> way;
  std::set<std::string> met;
  std::string at = record;
  for (;;) {
    std::optional<std::string> parent = parentOf(at);
    if (!parent || !met.insert(at).second) return way;
    way.push_back(std::move(at));
    at = std::move(*parent);
  }
}

std::vector<std::string> Hierarchy::below(const std::string &record) const {
  std::vector<std::string> found{record};
  std::set<std::string> met{record};
  for (std::size_t i = 0; i < found.size(); ++i) {
    SqlUse row = connection_.use("SELECT record FROM hierarchy WHERE zone = ? AND parent = ?");
    row.bind(zone_).bind(found[i]);
    while (row.step()) {
      if (met.insert(row.text(0)).second) found.push_back(row.text(0));
    }
  }
  return found;
}

}  // namespace droxa::embedded
