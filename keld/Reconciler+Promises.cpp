// Promises: files that stand for documents which aren't here. They are seen as their documents, under the
// documents' names.

#include "keld/Reconciler.h"
#include "keld/contents/DocumentClass.h"
#include "keld/contents/PromiseFile.h"

namespace droxa::keld {

std::optional<FileFacts> Reconciler::readFileOrPromise(int folder, const std::string &name) const {
  auto facts = ReadFileFacts(folder, name, opener_.replicaDevice());
  if (facts || !showsPromises_) return facts;
  return ReadPromisedFacts(folder, name, opener_.replicaDevice());
}

// The name of the document that `name` is about; nullopt for a promise of which nobody knows the document.
std::optional<std::string> Reconciler::documentName(ItemNumber folder, int descriptor,
                                                    const std::string &name) {
  if (!showsPromises_ || !IsPromiseName(name)) return name;
  const auto facts = ReadFileFacts(descriptor, name, opener_.replicaDevice());
  if (facts && facts->kind != NSFileProviderItemKind::document) return name;
  if (const auto document = NameOfPromise(name)) return document;
  if (const auto promise = ReadPromise(descriptor, name)) return promise->name;
  if (facts) return std::nullopt;
  // A promise with a shortened name has gone. Its document's name begins with what was left of it.
  constexpr std::size_t kHash = 17;
  const std::string beginning = name.substr(1, name.size() - 1 - kHash - sizeof ".droxafault" + 1);
  ListingKey key;
  key.atStart = false;
  key.name = beginning;
  for (const ItemRecord &record : queries_.childrenByName(folder, key, 1000))
    if (PromiseNameFor(record.name) == name) return record.name;
  return std::nullopt;
}

NameList Reconciler::documentNames(ItemNumber folder, int descriptor, const NameList &names) {
  NameList documents;
  for (std::size_t index = 0; index < names.size(); ++index) {
    const auto document = IsPromiseName(names[index])
                              ? documentName(folder, descriptor, std::string(names[index]))
                              : std::string(names[index]);
    if (document) documents.add(*document);
  }
  documents.sort();
  return documents;
}

}  // namespace droxa::keld
