#include "fileproviderd/PathResolver.h"

#include <filesystem>
#include <future>
#include <set>

#include "fileproviderd/HostErrors.h"
#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

namespace {

// The documents folder of the trash, which is laid out as file managers lay one out.
constexpr char kTrashDocuments[] = "files";

// What a call gave, waited for on the calling thread.
template <class Value>
struct Answer {
  Value value{};
  NSError error;
};

template <class Value, class Start>
Value waitFor(Start start, NSError *error) {
  auto promise = std::make_shared<std::promise<Answer<Value>>>();
  auto future = promise->get_future();
  start([promise](const Value &value, const NSError &failure) { promise->set_value({value, failure}); });
  Answer<Value> answer = future.get();
  if (answer.error) *error = answer.error;
  return answer.value;
}

NSError noSuchPath(const std::string &path) {
  return NSError(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem,
                 {{NSLocalizedDescriptionKey, "there is no item at " + path}});
}

NSURL appending(NSURL url, const std::vector<std::string> &components) {
  for (const std::string &component : components) url = url.URLByAppendingPathComponent(component);
  return url;
}

}  // namespace

std::vector<std::string> driveComponents(std::string_view path) {
  std::vector<std::string> components;
  while (!path.empty()) {
    const std::string_view component = path.substr(0, path.find('/'));
    path.remove_prefix(std::min(path.size(), component.size() + 1));
    if (component == "..") {
      if (!components.empty()) components.pop_back();
    } else if (!component.empty() && component != ".") {
      components.emplace_back(component);
    }
  }
  return components;
}

PathResolver::PathResolver(std::shared_ptr<ExtensionCalls> calls, std::string replica)
    : calls_(std::move(calls)), replica_(std::move(replica)) {}

std::shared_ptr<const NSFileProviderItem> PathResolver::itemAtPath(const std::string &path, NSError *error) {
  if (path.find('\0') != std::string::npos) {
    *error = noSuchPath(path.substr(0, path.find('\0')) + "\\0…");
    return nullptr;
  }
  const std::optional<Place> place = placeOfPath(path, error);
  if (!place) {
    if (!*error) *error = noSuchPath(path);
    return nullptr;
  }
  auto found = item(place->identifier, error);
  if (!found && !*error) *error = noSuchPath(path);
  const bool isAlias = found && place->url && found->itemIdentifier() != place->identifier;
  return isAlias ? aliasAt(*place, *found, error) : found;
}

std::shared_ptr<const NSFileProviderItem> PathResolver::aliasAt(const Place &place,
                                                                const NSFileProviderItem &target,
                                                                NSError *error) {
  const NSURL folder = place.url.URLByDeletingLastPathComponent();
  NSFileProviderItemFields fields = target.fields();
  fields.itemIdentifier = place.identifier;
  fields.filename = place.url.lastPathComponent();
  fields.kind = NSFileProviderItemKind::alias;
  fields.typeIdentifier = "inode/symlink";
  fields.parentItemIdentifier = NSFileProviderRootContainerItemIdentifier;
  if (folder != urlOf(NSFileProviderRootContainerItemIdentifier, error))
    fields.parentItemIdentifier = identifierAt(folder, error).value_or("");
  return *error ? nullptr : std::make_shared<NSFileProviderPlainItem>(std::move(fields));
}

std::optional<PathResolver::Place> PathResolver::placeOfPath(const std::string &path, NSError *error) {
  if (path.starts_with(replica_ + "/")) return placeAt(NSURL::fileURLWithPath(path), error);
  const std::vector<std::string> components = driveComponents(path);
  if (components.empty()) return Place{NSFileProviderRootContainerItemIdentifier, NSURL()};
  const NSURL root = urlOf(NSFileProviderRootContainerItemIdentifier, error);
  // Without a root URL nobody is signed in, or the daemon is away: the root's item says which.
  if (!root) {
    if (!*error) item(NSFileProviderRootContainerItemIdentifier, error);
    if (!*error || error->is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem))
      *error = rootIsUnknown();
    return std::nullopt;
  }
  if (auto place = placeAt(appending(root, components), error); place || *error) return place;
  return walk(root, components, error);
}

// Component by component: through containers, and through aliases, whose URLs are their targets'.
std::optional<PathResolver::Place> PathResolver::walk(const NSURL &root,
                                                      const std::vector<std::string> &components,
                                                      NSError *error) {
  NSURL folder = root;
  std::optional<Place> place;
  for (std::size_t index = 0; index < components.size(); ++index) {
    place = placeAt(folder.URLByAppendingPathComponent(components[index]), error);
    if (!place && !*error && index == 0) place = containerNamed(root, components[index], error);
    if (!place) return std::nullopt;
    if (index + 1 == components.size()) break;
    folder = urlOf(place->identifier, error);
    if (!folder) return std::nullopt;
  }
  return place;
}

std::optional<PathResolver::Place> PathResolver::containerNamed(const NSURL &root, const std::string &name,
                                                                NSError *error) {
  std::set<std::string> present;
  std::error_code problem;
  for (auto entry = std::filesystem::directory_iterator(replica_, problem);
       !problem && entry != std::filesystem::directory_iterator(); entry.increment(problem)) {
    present.insert(entry->path().filename().native());
  }
  const std::string documents = root.lastPathComponent();
  for (const std::string &folder : present) {
    bool known = false;
    {
      Lock held(lock_);
      known = containers_.contains(folder);
    }
    for (const std::string &child : {documents, std::string(kTrashDocuments)}) {
      const NSURL url = NSURL::fileURLWithPath(replica_ + "/" + folder + "/" + child);
      if (!known && url != root && std::filesystem::exists(url.path(), problem)) {
        rememberContainer(folder, url, error);
      }
      if (*error) return std::nullopt;
    }
  }
  Lock held(lock_);
  std::erase_if(containers_, [&](const auto &entry) { return !present.contains(entry.first); });
  for (const auto &[folder, container] : containers_)
    if (container.name == name) return container.place;
  return std::nullopt;
}

void PathResolver::rememberContainer(const std::string &folder, const NSURL &url, NSError *error) {
  const std::optional<Place> place = placeAt(url, error);
  if (!place) return;
  // A container that vanished between the two questions isn't an error of the path's.
  NSError ignored;
  const auto found = item(place->identifier, &ignored);
  if (!found) return;
  Lock held(lock_);
  containers_[folder] = {found->fields().filename, *place};
}

std::optional<PathResolver::Place> PathResolver::placeAt(const NSURL &url, NSError *error) {
  const std::optional<std::string> identifier = identifierAt(url, error);
  return identifier ? std::optional(Place{*identifier, url}) : std::nullopt;
}

std::shared_ptr<const NSFileProviderItem> PathResolver::item(const std::string &identifier, NSError *error) {
  return waitFor<std::shared_ptr<const NSFileProviderItem>>(
      [&](auto done) { calls_->itemForIdentifier(identifier, std::move(done)); }, error);
}

NSURL PathResolver::urlOf(const std::string &identifier, NSError *error) {
  return waitFor<NSURL>([&](auto done) { calls_->URLForItemIdentifier(identifier, std::move(done)); }, error);
}

std::optional<std::string> PathResolver::identifierAt(const NSURL &url, NSError *error) {
  return waitFor<std::optional<std::string>>(
      [&](auto done) { calls_->identifierForItemAtURL(url, std::move(done)); }, error);
}

}  // namespace droxa
