#pragma once

#include <map>
#include <set>
#include <string>
#include <vector>

#include "platform/cloudkit/embedded/ShareTable.h"

namespace droxa::embedded {

// Keeps the feeds of those with whom something of a zone is shared: what each account sees of it, and in
// which order that changed. Told of changes while a transaction makes them; finish() then brings every view
// to what the shares and the hierarchy say, inside the same transaction. Thread contract: the connection's.
class Views {
 public:
  Views(const Home &home, const Connection &connection, std::int64_t zone)
      : home_(home),
        connection_(connection),
        zone_(zone),
        hierarchy_(connection, zone),
        table_(connection, zone) {}

  // A record was saved or deleted where it was. `moved`: it came, went, or has another parent, so that what
  // lies below it goes along.
  void noteChange(const std::string &record, bool moved);
  // What the accounts may see was changed.
  void noteAccess(const std::vector<std::int64_t> &accounts);

  void finish();

 private:
  struct View {
    std::int64_t number = 0;
    std::set<ShareNumber> shares;  // that its account has access to
    std::set<std::string> shareRecords;
  };
  void refresh(std::int64_t account);
  void update(const std::vector<View> &views, const std::string &record);
  std::int64_t viewOf(std::int64_t account) const;
  std::vector<View> viewsOfOthers() const;
  std::set<std::string> seenIn(std::int64_t view) const;
  bool isSeenIn(std::int64_t view, const std::string &record) const;
  void tell(std::int64_t view, const std::string &record, bool isVisible);

  const Home &home_;
  const Connection &connection_;
  const std::int64_t zone_;
  const Hierarchy hierarchy_;
  const ShareTable table_;
  std::vector<std::string> changed_;  // in the order of the changes
  std::set<std::string> known_;       // those of changed_
  std::vector<std::string> moved_;
  std::set<std::int64_t> accounts_;
};

}  // namespace droxa::embedded
