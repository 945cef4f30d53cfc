#include "platform/cloudkit/embedded/Views.h"

#include <algorithm>

namespace droxa::embedded {

void Views::noteChange(const std::string &record, bool moved) {
  if (known_.insert(record).second) changed_.push_back(record);
  if (moved) moved_.push_back(record);
}

void Views::noteAccess(const std::vector<std::int64_t> &accounts) {
  accounts_.insert(accounts.begin(), accounts.end());
}

void Views::finish() {
  for (const std::string &record : moved_) {
    for (const std::string &lower : hierarchy_.below(record)) {
      if (known_.insert(lower).second) changed_.push_back(lower);
    }
  }
  // Those whose access is as before get the changes alone; the others first what they see now.
  const std::vector<View> views = viewsOfOthers();
  for (const std::string &record : changed_) update(views, record);
  for (const std::int64_t account : accounts_) refresh(account);
  changed_.clear();
  known_.clear();
  moved_.clear();
  accounts_.clear();
}

// One record, in every view.
void Views::update(const std::vector<View> &views, const std::string &record) {
  if (views.empty()) return;
  const std::vector<ShareNumber> covering = table_.withRootsAmong(hierarchy_.wayUp(record));
  for (const View &view : views) {
    const bool isVisible = view.shareRecords.contains(record) ||
                           std::any_of(covering.begin(), covering.end(),
                                       [&](ShareNumber share) { return view.shares.contains(share); });
    if (isVisible || isSeenIn(view.number, record)) tell(view.number, record, isVisible);
  }
}

// All that the account sees, parents first.
void Views::refresh(std::int64_t account) {
  const std::int64_t view = viewOf(account);
  const std::set<std::string> before = seenIn(view);
  std::set<std::string> now;
  for (const SharePlace &place : table_.sharesOf(account)) {
    std::vector<std::string> visible = hierarchy_.below(place.root);
    visible.push_back(place.record);
    for (const std::string &record : visible) {
      if (now.insert(record).second && !before.contains(record)) tell(view, record, true);
    }
  }
  for (const std::string &record : before) {
    if (!now.contains(record)) tell(view, record, false);
  }
}

std::int64_t Views::viewOf(std::int64_t account) const {
  connection_.use("INSERT OR IGNORE INTO views (account, zone) VALUES (?, ?)")
      .bind(account)
      .bind(zone_)
      .run();
  SqlUse row = connection_.use("SELECT id FROM views WHERE account = ? AND zone = ?");
  row.bind(account).bind(zone_).step();
  return row.integer(0);
}

std::vector<Views::View> Views::viewsOfOthers() const {
  std::vector<View> views;
  SqlUse row = connection_.use("SELECT id, account FROM views WHERE zone = ?");
  row.bind(zone_);
  while (row.step()) {
    View view;
    view.number = row.integer(0);
    for (const SharePlace &place : table_.sharesOf(row.integer(1))) {
      view.shares.insert(place.share);
      view.shareRecords.insert(place.record);
    }
    views.push_back(std::move(view));
  }
  return views;
}

std::set<std::string> Views::seenIn(std::int64_t view) const {
  std::set<std::string> records;
  SqlUse row = connection_.use("SELECT record FROM view_records WHERE view = ? AND visible");
  row.bind(view);
  while (row.step()) records.insert(row.text(0));
  return records;
}

bool Views::isSeenIn(std::int64_t view, const std::string &record) const {
  SqlUse row = connection_.use("SELECT visible FROM view_records WHERE view = ? AND record = ?");
  return row.bind(view).bind(record).step() && row.integer(0) != 0;
}

void Views::tell(std::int64_t view, const std::string &record, bool isVisible) {
  std::int64_t seq = 0;
  {
    SqlUse row = connection_.use("UPDATE views SET seq = seq + 1 WHERE id = ? RETURNING seq");
    row.bind(view);
    if (row.step()) seq = row.integer(0);
    row.run();
  }
  connection_
      .use(
          "INSERT OR REPLACE INTO view_records (view, record, seq, visible, type, device, session)"
          " SELECT ?, name, ?, ?, type, ?, ? FROM records WHERE zone = ? AND name = ?")
      .bind(view)
      .bind(seq)
      .bind(isVisible ? 1 : 0)
      .bind(home_.deviceName())
      .bind(home_.session())
      .bind(zone_)
      .bind(record)
      .run();
}

}  // namespace droxa::embedded
