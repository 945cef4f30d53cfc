#include "tests/support/FakeDaemonWorld.h"

#include "tessaly/QVContainer.h"

namespace droxa {

FakeDaemonWorld::FakeDaemonWorld(Carry carry) : fake_(FakeDaemon::make("/replica")) {
  fake_->addContainer(kConformanceContainer);
  carried_ = carry ? carry(fake_) : fake_;
}

FakeDaemonWorld::~FakeDaemonWorld() = default;

NSURL FakeDaemonWorld::documents(const std::string &containerID) {
  return NSURL::fileURLWithPath("/replica/" + containerID + "/" + QVDocumentsFolderName(containerID));
}

void FakeDaemonWorld::makeFile(const NSURL &url, std::size_t size) {
  fake_->addDocument(url.path(), size);
}

bool FakeDaemonWorld::addDatalessDocument(const NSURL &url, const std::string &contents) {
  fake_->addDatalessDocument(url.path(), contents.size());
  return true;
}

void FakeDaemonWorld::changeFile(const NSURL &url, std::size_t size, std::int64_t seconds) {
  fake_->setContents(url.path(), size, seconds * 1'000'000'000);
}

void FakeDaemonWorld::makeFolder(const NSURL &url) {
  fake_->addFolder(url.path());
}

void FakeDaemonWorld::makeAlias(const NSURL &url, const NSURL & /*target*/) {
  fake_->addAlias(url.path());
}

void FakeDaemonWorld::makeSymbolicLink(const NSURL &url, const std::string & /*target*/) {
  fake_->addSymbolicLink(url.path());
}

void FakeDaemonWorld::rename(const NSURL &from, const NSURL &to) {
  fake_->rename(from.path(), to.path());
}

void FakeDaemonWorld::remove(const NSURL &url) {
  fake_->remove(url.path());
}

void FakeDaemonWorld::settle() {}  // the drive is the daemon's own

}  // namespace droxa
