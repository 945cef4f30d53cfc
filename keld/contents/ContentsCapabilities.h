#pragma once

namespace droxa::keld {

// How a document without contents looks in a replica.
enum class DatalessForm {
  placeholder,  // a sparse file at the document's own path, marked in an extended attribute
  promise,      // a small hidden file beside where the document would be
};

// What the file system of a replica can do. Found out once, by trying. Thread contract: a value.
struct ContentsCapabilities {
  bool extendedAttributes = false;
  bool holes = false;     // files without data extents, punching, SEEK_DATA
  bool exchange = false;  // two names swapped in one step
  bool leases = false;    // the kernel tells who has a file open

  DatalessForm form() const {
    return extendedAttributes && holes && exchange ? DatalessForm::placeholder : DatalessForm::promise;
  }
  bool operator==(const ContentsCapabilities &) const = default;
};

// Tries everything with short-lived files in the open folder. 0, or the errno that kept it from making any.
int ProbeContentsCapabilities(int folder, ContentsCapabilities *capabilities);

}  // namespace droxa::keld
