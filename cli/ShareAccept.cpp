#include <nlohmann/json.hpp>

#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/Share.h"
#include "cli/Text.h"

namespace droxa {

int runShareAccept(CommandContext &context, const std::string &url, bool json) {
  const NSURL shareURL = NSURL::URLWithString(url);
  if (!shareURL) {
    context.err << "droxa: " << escapedText(url)
                << ": it isn't a URL; `droxa share link` prints that of a share" << std::endl;
    return kExitUsage;
  }
  const auto place = DaemonClient(context.daemon, context.timeout).acceptShare(shareURL);
  if (place.error) return reportError(context, url, place.error);
  if (json) {
    const nlohmann::ordered_json object{{"share", url}, {"path", place.value.path()}};
    context.out << object.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace) << std::endl;
  } else {
    context.out << escapedText(place.value.path()) << std::endl;
  }
  return kExitSuccess;
}

}  // namespace droxa
