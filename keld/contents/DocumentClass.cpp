#include "keld/contents/DocumentClass.h"

#include <cerrno>
#include <fcntl.h>

#include "keld/contents/FileSteps.h"
#include "keld/contents/PromiseFile.h"

namespace droxa::keld {

namespace {

bool agrees(const DocumentMarker &marker, const FileFacts &facts) {
  return facts.size == marker.size && facts.modified == marker.modified;
}

// The file systems that need promises may keep dates in steps of two seconds.
bool agreesRoughly(const DocumentMarker &marker, const FileFacts &facts) {
  constexpr std::int64_t kStep = 2'000'000'000;
  return facts.size == marker.size && facts.modified > marker.modified - kStep &&
         facts.modified < marker.modified + kStep;
}

// A file that is marked as dataless, by who wrote what since.
DocumentClass classOfDataless(int file, const DocumentMarker &marker, const FileFacts &facts,
                              DataCoverage coverage) {
  switch (coverage) {
    case DataCoverage::some:
      return DocumentClass::partlyWritten;
    case DataCoverage::none:
      if (facts.size == marker.size) return DocumentClass::dataless;
      // Cut to nothing it is a whole document, if an empty one; cut to anything else, bytes are missing.
      return facts.size == 0 ? DocumentClass::overwritten : DocumentClass::partlyWritten;
    case DataCoverage::all:
      break;
  }
  // Zeros of a tool that copies attributes but not holes. Whoever writes doesn't leave both as they were.
  if (agrees(marker, facts)) return DocumentClass::dataless;
  const bool wasAppendedTo = facts.size > marker.size && BeginsWithZeros(file, marker.size);
  return wasAppendedTo ? DocumentClass::partlyWritten : DocumentClass::overwritten;
}

// A file whose eviction didn't come to its end. Punching changes the modification time, and so does a writer:
// what has lost nothing yet, or everything, is certainly ours; the rest is taken for the user's.
DocumentClass classOfEvicting(const DocumentMarker &marker, const FileFacts &facts, DataCoverage coverage) {
  if (facts.size == marker.size && (coverage == DataCoverage::none || facts.modified == marker.modified))
    return DocumentClass::evicting;
  if (coverage == DataCoverage::all || facts.size == 0) return DocumentClass::overwritten;
  return DocumentClass::partlyWritten;
}

// Fills in the class of a marked regular file.
void classify(int file, DocumentLook *look) {
  const DocumentMarker &marker = *look->marker;
  if (marker.state == MarkerState::folder) {
    look->marker.reset();
    look->kind = DocumentClass::plain;
    return;
  }
  if (marker.state == MarkerState::present) {
    look->kind = agrees(marker, look->facts) ? DocumentClass::present : DocumentClass::edited;
    return;
  }
  if (look->facts.size == 0 && marker.size == 0) {
    look->kind = DocumentClass::present;
    return;
  }
  DataCoverage coverage;
  look->error = ReadDataCoverage(file, look->facts.size, &coverage);
  if (look->error != 0) {
    look->kind = DocumentClass::unreadable;
  } else {
    look->kind = marker.state == MarkerState::dataless ? classOfDataless(file, marker, look->facts, coverage)
                                                       : classOfEvicting(marker, look->facts, coverage);
  }
}

DocumentLook unreadable(DocumentLook look, int error) {
  look.kind = DocumentClass::unreadable;
  look.error = error;
  return look;
}

DocumentLook lookAtPromise(int folder, const PromiseFile &promise, std::uint64_t ownDevice) {
  DocumentLook look;
  const auto facts = ReadFileFacts(folder, PromiseNameFor(promise.name), ownDevice);
  if (!facts) return look;
  if (facts->kind != NSFileProviderItemKind::document) return look;
  look.facts = *facts;
  look.kind = DocumentClass::dataless;
  look.marker = promise.marker;
  look.isPromised = true;
  look.facts.isPromise = true;
  look.facts.size = promise.marker.size;
  look.facts.modified = promise.modified;
  look.facts.mode = (facts->mode & ~07777U) | promise.mode;
  return look;
}

DocumentLook lookAtFile(int folder, const std::string &name, DocumentLook look, std::uint64_t ownDevice) {
  if (look.marker->state == MarkerState::present || look.marker->state == MarkerState::folder) {
    classify(-1, &look);
    return look;
  }
  const OwnedDescriptor file = OpenFileIn(folder, name, O_RDONLY);
  if (!file) {
    if (errno == ENOENT) return {};
    return unreadable(std::move(look), errno);
  }
  const bool isPromised = look.isPromised;
  look = ClassifyOpenDocument(file.get(), ownDevice);  // facts, marker and extents of one and the same file
  look.isPromised = isPromised;
  return look;
}

}  // namespace

std::optional<FileFacts> ReadPromisedFacts(int folder, const std::string &name, std::uint64_t ownDevice) {
  const auto promise = ReadPromise(folder, PromiseNameFor(name));
  if (!promise || promise->name != name) return std::nullopt;
  const DocumentLook look = lookAtPromise(folder, *promise, ownDevice);
  return look.isPromised ? std::optional(look.facts) : std::nullopt;
}

DocumentLook ClassifyOpenDocument(int descriptor, std::uint64_t ownDevice) {
  DocumentLook look;
  const auto facts = ReadFolderFacts(descriptor, ownDevice);
  if (!facts || facts->kind != NSFileProviderItemKind::document) {
    look.kind = DocumentClass::notADocument;
    return look;
  }
  look.facts = *facts;
  if (const int error = ReadMarkerOrError(descriptor, nullptr, &look.marker); error != 0)
    return unreadable(std::move(look), error);
  look.kind = DocumentClass::plain;
  if (look.marker) classify(descriptor, &look);
  return look;
}

DocumentLook ClassifyDocument(int folder, const std::string &name, DatalessForm form,
                              std::uint64_t ownDevice) {
  std::optional<PromiseFile> promise;
  if (form == DatalessForm::promise) {
    promise = ReadPromise(folder, PromiseNameFor(name));
    if (promise && promise->name != name) promise.reset();
  }
  const auto facts = ReadFileFacts(folder, name, ownDevice);
  if (!facts) return promise ? lookAtPromise(folder, *promise, ownDevice) : DocumentLook{};
  DocumentLook look;
  look.facts = *facts;
  look.isPromised = promise.has_value();
  look.kind = DocumentClass::notADocument;
  if (facts->kind != NSFileProviderItemKind::document) return look;
  if (const int error = ReadMarkerOrError(folder, &name, &look.marker); error != 0)
    return error == ENOENT ? DocumentLook{} : unreadable(std::move(look), error);
  look.kind = DocumentClass::plain;
  if (look.marker) return lookAtFile(folder, name, std::move(look), ownDevice);
  if (promise) {
    look.marker = promise->marker;
    look.kind = agreesRoughly(promise->marker, *facts) ? DocumentClass::present : DocumentClass::overwritten;
  }
  return look;
}

}  // namespace droxa::keld
