#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "tests/support/FakeSharing.h"

namespace droxa {

// One of the twelve sharing operations, with arguments that a test recognises. Its reply comes as answers of
// which only those that the operation has are set.
struct ShareCall {
  using Replied = std::function<void(const FakeSharing::Answers &values, const NSError &error)>;

  std::string name;       // of the member function
  std::string selector;   // as log lines have it
  std::string privilege;  // the question that guards it
  bool hasOperation;
  bool hasShare;
  std::size_t positions;  // of the reply, the error's included
  std::string arguments;  // as the fake daemon records them
  std::function<void(QVShareOperationProtocol &, std::shared_ptr<QVOperationClient>, Replied)> make;
  // What is left of the answers in its reply.
  std::function<FakeSharing::Answers(const FakeSharing::Answers &)> expected;
};

// A share with something in every member.
CKShare wholeShare();
// Answers with something in every member but the URL's wrapper.
FakeSharing::Answers wholeAnswers();
const std::vector<ShareCall> &shareCalls();
const ShareCall &shareCall(const std::string &name);

// Whether the replies are the same; wrappers by what they wrap.
bool sameAnswers(const FakeSharing::Answers &one, const FakeSharing::Answers &other);
// The values of the reply's positions, without the error, as log lines show them.
std::vector<std::string> loggedValues(const ShareCall &call, const FakeSharing::Answers &answers);

}  // namespace droxa
