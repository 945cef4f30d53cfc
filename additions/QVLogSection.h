#pragma once

#include <cstdint>

namespace droxa {

// Log sections: the tag that a request bears in all its log lines, so that the lines of requests that run at
// the same time can be told apart. Lines are marked ┏ (opened, logged by the opener), ┣ (on the way), ┳ (a
// reply came) and ┗ (closed). Debug sections have odd tags, information sections even ones. Thread contract:
// any thread but the queue "create-log-section" itself; a section may be closed on another thread than the
// one that opened it.

// Opens a section: its tag, which is greater than every tag before it and never 0.
std::uint64_t QVLogSectionCreate(bool isInformation);

// Closes a section: logs its ┗ line at the section's level. Tag 0 stands for no section and logs nothing.
void QVLogSectionEnd(std::uint64_t tag);

// Closes a section when the scope is left, by whichever way. For a section that ends in a later reply, create
// and end it by hand.
class QVLogSection {
 public:
  explicit QVLogSection(bool isInformation) : tag_(QVLogSectionCreate(isInformation)) {}
  ~QVLogSection() { QVLogSectionEnd(tag_); }
  QVLogSection(const QVLogSection &) = delete;
  QVLogSection &operator=(const QVLogSection &) = delete;

  std::uint64_t tag() const { return tag_; }

 private:
  const std::uint64_t tag_;
};

}  // namespace droxa
