#include "cli/ItemArgument.h"

#include <algorithm>

#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVFileObjectID.h"

namespace droxa {

namespace {

bool isFrameworkContainer(std::string_view argument) {
  return argument == NSFileProviderRootContainerItemIdentifier ||
         argument == NSFileProviderWorkingSetContainerItemIdentifier ||
         argument == NSFileProviderAllDirectoriesContainerItemIdentifier;
}

bool isRootPath(std::string_view argument) {
  return argument.empty() || argument == "." ||
         std::all_of(argument.begin(), argument.end(), [](char character) { return character == '/'; });
}

}  // namespace

bool looksLikeIdentifier(std::string_view argument) {
  return isFrameworkContainer(argument) || QVFileObjectID::fileObjectIDWithString(argument).has_value();
}

CallResult<ControlClient::Item> resolveItem(ControlClient &client, const std::string &argument) {
  if (!looksLikeIdentifier(argument)) return client.itemAtPath(argument.empty() ? "/" : argument);
  auto found = client.item(argument);
  if (!found.error.is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem)) return found;
  auto named = client.itemAtPath("/" + argument);
  return named.error ? found : named;
}

CallResult<ResolvedContainer> resolveContainer(ControlClient &client, const std::string &argument) {
  if (isRootPath(argument)) return {{NSFileProviderRootContainerItemIdentifier, nullptr}, NSError()};
  if (isFrameworkContainer(argument)) return {{argument, nullptr}, NSError()};
  const auto found = resolveItem(client, argument);
  if (found.error) return {{}, found.error};
  if (!found.value) return {{}, fileProviderErrorForNonExistentItemWithIdentifier(argument)};
  auto item = found.value;
  if (item->fields().kind == NSFileProviderItemKind::alias) {
    // By its identifier an alias is its target.
    const auto target = client.item(item->itemIdentifier());
    if (!target.value) return {{}, target.error};
    item = target.value;
  }
  return {{item->itemIdentifier(), item}, NSError()};
}

}  // namespace droxa
