#include "fileproviderd/DesktopThumbnailFiller.h"

#include <algorithm>
#include <future>
#include <map>
#include <tuple>

#include "fileproviderd/RelayedThumbnails.h"
#include "platform/foundation/NSURL.h"
#include "platform/oslog/os_log.h"

namespace droxa {

namespace {

constexpr std::size_t kMostWaiting = 50'000;
constexpr std::size_t kMostKnownWithout = 100'000;
constexpr std::size_t kOfOneRequest = 200;
constexpr std::chrono::minutes kBeforeAskingAgain{1};
constexpr CGSize kLargest{1024, 1024};

os_log_t log() {
  static const os_log_t made = os_log_create("com.quorva.droxa", "desktop-thumbnails");
  return made;
}

// What `begin` gives its argument, which it calls exactly once, on any thread.
template <class... Values, class Begin>
std::tuple<Values...> await(const Begin &begin) {
  const auto promise = std::make_shared<std::promise<std::tuple<Values...>>>();
  auto future = promise->get_future();
  begin([promise](const Values &...values) { promise->set_value({values...}); });
  return future.get();
}

bool isDatalessDocument(const NSFileProviderItemFields &item) {
  return item.kind == NSFileProviderItemKind::document && !item.isDownloaded && item.documentSize > 0 &&
         !item.isTrashed && static_cast<bool>(item.contentModificationDate);
}

// Rounded down, as the file system's seconds are.
std::int64_t secondsOf(const NSDate &date) {
  constexpr std::int64_t kSecond = 1'000'000'000;
  const std::int64_t nanoseconds = date.nanosecondsSince1970();
  return nanoseconds / kSecond - (nanoseconds % kSecond < 0 ? 1 : 0);
}

bool isPlainContainer(const std::string &container) {
  return container != NSFileProviderWorkingSetContainerItemIdentifier &&
         container != NSFileProviderAllDirectoriesContainerItemIdentifier;
}

}  // namespace

DesktopThumbnailFiller::DesktopThumbnailFiller(std::shared_ptr<ExtensionCalls> calls, DesktopThumbnails cache,
                                               std::vector<ShownFolder> folders)
    : calls_(std::move(calls)),
      cache_(std::move(cache)),
      queue_(dispatch_queue_create("desktop-thumbnails", DISPATCH_QUEUE_SERIAL)),
      folders_(std::move(folders)) {}

void DesktopThumbnailFiller::addShownFolder(const ShownFolder &folder) {
  const Lock lock(lock_);
  folders_.push_back(folder);
}

void DesktopThumbnailFiller::itemsWereListed(const std::string &container, const NSFileProviderItems &items) {
  if (!isPlainContainer(container)) return;
  NSFileProviderItems dataless;
  std::copy_if(items.begin(), items.end(), std::back_inserter(dataless),
               [](const auto &item) { return isDatalessDocument(item->fields()); });
  if (dataless.empty()) return;
  {
    const Lock lock(lock_);
    if (waiting_ + dataless.size() > kMostWaiting) return;
    waiting_ += dataless.size();
  }
  dispatch_async(queue_, [self = shared_from_this(), container, dataless] {
    if (const NSError error = self->fill(container, dataless, Again::no))
      os_log_error(log(), "[ERROR] no thumbnails for the desktop of what is in %@: %@", container, error);
    const Lock lock(self->lock_);
    self->waiting_ -= dataless.size();
  });
}

void DesktopThumbnailFiller::fillContainer(const std::string &container,
                                           NSFileProviderErrorCompletion completion) {
  dispatch_async(queue_, [self = shared_from_this(), container, completion = std::move(completion)] {
    NSFileProviderItems items;
    NSError error = self->list(container, &items);
    if (!error) error = self->fill(container, items, Again::yes);
    completion(error);
  });
}

NSError DesktopThumbnailFiller::list(const std::string &container, NSFileProviderItems *items) const {
  using Enumerator = std::shared_ptr<NSFileProviderRemoteEnumerator>;
  const auto [enumerator, failure] = await<Enumerator, NSError>(
      [&](const auto &reply) { calls_->enumeratorForContainer(container, reply); });
  if (!enumerator) return failure;
  NSError error;
  for (NSData page = NSFileProviderInitialPageSortedByName(); page && !error;) {
    const auto answer = await<NSFileProviderItems, NSData, NSError>(
        [&, &from = *enumerator](const auto &reply) { from.enumerateItems(page, reply); });
    for (const auto &item : std::get<0>(answer))
      if (isDatalessDocument(item->fields())) items->push_back(item);
    page = std::get<1>(answer);
    error = std::get<2>(answer);
  }
  enumerator->invalidate();
  return error;
}

NSError DesktopThumbnailFiller::locate(const std::string &container, std::string *path) const {
  const auto [url, error] =
      await<NSURL, NSError>([&](const auto &reply) { calls_->URLForItemIdentifier(container, reply); });
  *path = url.path();
  return error;
}

bool DesktopThumbnailFiller::hadNone(const Wanted &document) const {
  const auto found = without_.find(document.state());
  return found != without_.end() && std::chrono::steady_clock::now() - found->second < kBeforeAskingAgain;
}

NSError DesktopThumbnailFiller::fill(const std::string &container, const NSFileProviderItems &items,
                                     Again again) {
  std::string folder;
  if (const NSError error = locate(container, &folder)) return error;
  if (folder.empty()) return {};
  std::vector<Wanted> documents;
  for (const auto &item : items) {
    Wanted document = wanted(folder, item->fields());
    if (!document.subjects.empty() && (again == Again::yes || !hadNone(document)))
      documents.push_back(std::move(document));
    if (documents.size() < kOfOneRequest) continue;
    if (const NSError error = fetch(documents)) return error;
    documents.clear();
  }
  return documents.empty() ? NSError() : fetch(documents);
}

DesktopThumbnailFiller::Wanted DesktopThumbnailFiller::wanted(const std::string &folder,
                                                              const NSFileProviderItemFields &item) {
  Wanted document{item.itemIdentifier, {}};
  const std::string path = folder + "/" + item.filename;
  std::vector<ShownFolder> places;
  {
    const Lock lock(lock_);
    places = folders_;
  }
  for (const ShownFolder &place : places) {
    if (!path.starts_with(place.replica + "/")) continue;
    const DesktopThumbnailSubject subject{place.shown + path.substr(place.replica.size()),
                                          secondsOf(item.contentModificationDate), item.documentSize};
    if (!cache_.hasAll(subject)) document.subjects.push_back(subject);
  }
  return document;
}

NSError DesktopThumbnailFiller::fetch(const std::vector<Wanted> &documents) {
  std::map<std::string, const Wanted *> byIdentifier;
  std::vector<std::string> identifiers;
  for (const Wanted &document : documents) {
    identifiers.push_back(document.identifier);
    byIdentifier[document.identifier] = &document;
  }
  const auto [thumbnails, failure] = await<std::shared_ptr<FPDThumbnails>, NSError>(
      [&](const auto &reply) { RelayedThumbnails::open(calls_, identifiers, kLargest, reply); });
  if (!thumbnails) return failure;
  NSError notKept;
  for (;;) {
    const auto [some, isLast, error] = await<std::vector<FPDThumbnail>, bool, NSError>(
        [&, &from = *thumbnails](const auto &reply) { from.nextWithReply(reply); });
    for (const FPDThumbnail &thumbnail : some) {
      const auto found = byIdentifier.find(thumbnail.identifier);
      if (found == byIdentifier.end()) continue;
      if (NSError failed = store(*found->second, thumbnail)) notKept = failed;
    }
    if (isLast) return error ? error : notKept;
  }
}

NSError DesktopThumbnailFiller::store(const Wanted &document, const FPDThumbnail &thumbnail) {
  const auto picture = thumbnail.error ? std::nullopt : PNGImage::read(thumbnail.imageData, nullptr);
  if (!picture) {
    if (without_.size() >= kMostKnownWithout) without_.clear();
    if (!thumbnail.error) without_[document.state()] = std::chrono::steady_clock::now();
    return {};
  }
  for (const DesktopThumbnailSubject &subject : document.subjects)
    if (NSError error = cache_.store(subject, *picture)) return error;
  return {};
}

}  // namespace droxa
