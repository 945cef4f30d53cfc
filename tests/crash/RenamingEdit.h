#pragma once

#include <string>

namespace droxa::crash {

// How an editor saves that writes a temporary file and renames it over the document. It holds both folders
// open: where one of them is moved meanwhile it finds its files there, and leaves nothing behind. What isn't
// put over the document is removed with it. Thread contract: one thread.
class RenamingEdit {
 public:
  // The temporary lies in `temporaryFolder`; "": beside the document.
  RenamingEdit(const std::string &document, const std::string &temporaryFolder, std::string temporaryName);
  ~RenamingEdit();
  RenamingEdit(const RenamingEdit &) = delete;
  RenamingEdit &operator=(const RenamingEdit &) = delete;

  // The document as it is now, to be closed by the caller; -1 when there is none.
  int openDocument() const;
  // Makes the temporary; false when it can't be made. It is this one's.
  bool makeTemporary();
  int temporary() const { return temporary_; }
  bool renameOver();

 private:
  const std::string documentName_, temporaryName_;
  int folder_ = -1, temporaryFolder_ = -1, temporary_ = -1;
  bool isRenamed_ = false;
};

}  // namespace droxa::crash
