#pragma once

#include <functional>
#include <memory>
#include <string>

#include "tests/support/FakeDaemon.h"
#include "tests/support/conformance/DaemonWorld.h"

namespace droxa {

// The conformance suite's world over the fake daemon, asked directly or through whatever `carry` puts before
// it. Thread contract: the test's thread.
class FakeDaemonWorld final : public DaemonWorld {
 public:
  using Carry = std::function<std::shared_ptr<QVProtocol>(const std::shared_ptr<FakeDaemon> &daemon)>;
  explicit FakeDaemonWorld(Carry carry = nullptr);
  ~FakeDaemonWorld() override;

  std::shared_ptr<QVProtocol> daemon() override { return carried_; }
  FakeDaemon &fake() { return *fake_; }
  NSURL documents(const std::string &containerID) override;
  void makeFile(const NSURL &url, std::size_t size) override;
  bool addDatalessDocument(const NSURL &url, const std::string &contents) override;
  void changeFile(const NSURL &url, std::size_t size, std::int64_t seconds) override;
  void makeFolder(const NSURL &url) override;
  void makeAlias(const NSURL &url, const NSURL &target) override;
  void makeSymbolicLink(const NSURL &url, const std::string &target) override;
  void rename(const NSURL &from, const NSURL &to) override;
  void remove(const NSURL &url) override;
  void settle() override;

 private:
  const std::shared_ptr<FakeDaemon> fake_;
  std::shared_ptr<QVProtocol> carried_;
};

}  // namespace droxa
