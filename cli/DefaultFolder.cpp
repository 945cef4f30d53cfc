#include <nlohmann/json.hpp>

#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVErrors.h"

namespace droxa {

namespace {

// What only this command means by them; "" for every other error.
std::string explanation(const std::string &application, const NSError &error) {
  if (error.is(QVTessalyErrorDomain, QVErrorNotEntitled)) {
    return "it is not entitled to a folder of the drive; an administrator grants one in "
           "/etc/droxa/entitlements.d (`droxa entitlements` shows what is granted)";
  }
  if (error.is(QVTessalyErrorDomain, QVErrorInvalidArgument)) {
    return "no application of that identifier is installed; there has to be a desktop entry " +
           escapedText(application) + ".desktop";
  }
  return {};
}

int show(CommandContext &context, const std::string &asked, const ControlClient::Item &item, bool json) {
  const auto url = context.host->url(item->itemIdentifier());
  if (!url.value) return reportError(context, asked, url.error);
  if (json) {
    const nlohmann::ordered_json object{{"identifier", item->itemIdentifier()},
                                        {"name", item->fields().filename},
                                        {"path", url.value.path()}};
    context.out << object.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace) << std::endl;
  } else {
    context.out << escapedText(url.value.path()) << std::endl;
  }
  return kExitSuccess;
}

}  // namespace

int runDefaultFolder(CommandContext &context, const std::optional<std::string> &application, bool json) {
  const std::string asked = application.value_or("the documents folder");
  const auto found = context.host->defaultContainer(application);
  if (found.value) return show(context, asked, found.value, json);
  const std::string text = explanation(asked, found.error);
  if (text.empty() || !application) {
    const NSError nothing = fileProviderErrorForNonExistentItemWithIdentifier(asked);
    return reportError(context, asked, found.error ? found.error : nothing);
  }
  context.err << "droxa: " << escapedText(asked) << ": " << text << std::endl;
  return kExitFailure;
}

}  // namespace droxa
