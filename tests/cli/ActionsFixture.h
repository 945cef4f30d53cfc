#pragma once

#include <cerrno>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/Actions.h"
#include "cli/ItemText.h"
#include "tests/cli/ScriptedHost.h"

namespace droxa::testing {

using Kind = FPDActionRequest::Kind;
using Words = std::vector<std::string>;

inline const std::string kRoot = NSFileProviderRootContainerItemIdentifier;

// A drive with the document "a.txt" (d1) in the root, and the folder "in" (i2) with "b.txt" (d3). Actions end
// as `result` and `failures` say.
class ActionsTest : public ::testing::Test, protected CommandFixture {
 protected:
  ActionsTest() {
    stop = [] { return false; };
    name("/", root());
    name("a.txt", item("d1", "a.txt"));
    name("in", folder("i2", "in"));
    NSFileProviderItemFields inner = item("d3", "b.txt");
    inner.parentItemIdentifier = "i2";
    name("in/b.txt", inner);
    host->act = [this](const FPDActionRequest &) { return done(); };
  }
  static NSFileProviderItemFields root() {
    NSFileProviderItemFields fields = folder(kRoot, "");
    return fields;
  }
  void name(const std::string &path, const NSFileProviderItemFields &fields) {
    host->items[fields.itemIdentifier] = fields;
    host->paths[path] = fields.itemIdentifier;
    host->paths["./" + path] = fields.itemIdentifier;
    if (path != "/") host->paths["/" + path] = fields.itemIdentifier;
  }
  std::shared_ptr<FPDAction> done() {
    auto action = std::make_shared<ScriptedAction>();
    NSError failure;
    if (!failures.empty()) {
      failure = failures.front();
      failures.erase(failures.begin());
    }
    if (failure) {
      action->end(nullptr, failure);
    } else {
      action->end(result ? std::make_shared<NSFileProviderPlainItem>(*result) : nullptr);
    }
    return action;
  }
  const FPDActionRequest &request(std::size_t index = 0) const { return host->requests.at(index); }
  bool said(const std::string &words) const { return err.str().find(words) != std::string::npos; }
  bool printed(const NSFileProviderItemFields &fields) const { return out.str() == longLine(fields) + "\n"; }

  std::optional<NSFileProviderItemFields> result = item("d9", "result");
  std::vector<NSError> failures;  // of the next actions; nil: done
};

}  // namespace droxa::testing
