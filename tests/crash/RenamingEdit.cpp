#include "tests/crash/RenamingEdit.h"

#include <cstdio>
#include <fcntl.h>
#include <unistd.h>
#include <utility>

namespace droxa::crash {

namespace {

int openFolder(const std::string &path) {
  return ::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
}

void closeAll(std::initializer_list<int> descriptors) {
  for (const int descriptor : descriptors)
    if (descriptor >= 0) ::close(descriptor);
}

}  // namespace

RenamingEdit::RenamingEdit(const std::string &document, const std::string &temporaryFolder,
                           std::string temporaryName)
    : documentName_(document.substr(document.rfind('/') + 1)),
      temporaryName_(std::move(temporaryName)),
      folder_(openFolder(document.substr(0, document.rfind('/')))) {
  if (folder_ < 0) return;
  temporaryFolder_ =
      temporaryFolder.empty() ? ::fcntl(folder_, F_DUPFD_CLOEXEC, 0) : openFolder(temporaryFolder);
}

RenamingEdit::~RenamingEdit() {
  if (temporary_ >= 0 && !isRenamed_) ::unlinkat(temporaryFolder_, temporaryName_.c_str(), 0);
  closeAll({folder_, temporaryFolder_, temporary_});
}

int RenamingEdit::openDocument() const {
  if (folder_ < 0) return -1;
  return ::openat(folder_, documentName_.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
}

bool RenamingEdit::makeTemporary() {
  if (temporaryFolder_ >= 0)
    temporary_ =
        ::openat(temporaryFolder_, temporaryName_.c_str(), O_CREAT | O_EXCL | O_RDWR | O_CLOEXEC, 0644);
  return temporary_ >= 0;
}

bool RenamingEdit::renameOver() {
  isRenamed_ = ::renameat(temporaryFolder_, temporaryName_.c_str(), folder_, documentName_.c_str()) == 0;
  return isRenamed_;
}

}  // namespace droxa::crash
