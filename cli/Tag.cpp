#include <algorithm>

#include "cli/Acting.h"
#include "cli/ActionArgument.h"
#include "cli/Actions.h"
#include "cli/ExitStatus.h"
#include "cli/ItemText.h"
#include "cli/Text.h"
#include "platform/fileprovider/FPTags.h"

namespace droxa {

namespace {

using Tags = std::vector<FPTag>;

Tags::iterator find(Tags &tags, const std::string &label) {
  return std::find_if(tags.begin(), tags.end(), [&](const FPTag &tag) { return tag.label == label; });
}

int setTags(CommandContext &context, const std::string &argument, const std::string &identifier,
            const Tags &tags, bool json) {
  FPDActionRequest request;
  request.kind = FPDActionRequest::Kind::setTagData;
  request.identifier = identifier;
  request.tagData = FPGetTagsDataFromTags(tags);
  return actAndReport(context, argument, request, json);
}

// Whether the label can travel: it would be left out of the tag data otherwise.
bool isLabel(CommandContext &context, const std::string &label) {
  if (FPGetTagsDataFromTags({{label, 0}})) return true;
  context.err << "droxa: " << escapedText(label)
              << ": it can't be a tag, which is UTF-8 without control characters, and not empty" << std::endl;
  return false;
}

}  // namespace

int runTag(CommandContext &context, const std::string &argument, const std::vector<std::string> &names,
           bool json) {
  int exitStatus = kExitSuccess;
  const auto item = resolveForAction(context, argument, &exitStatus);
  if (!item) return exitStatus;
  Tags tags = FPGetTagsFromTagsData(item->fields().tagData);
  if (names.empty()) {
    if (json) {
      context.out << itemJSON(item->fields()) << std::endl;
    } else {
      for (const FPTag &tag : tags) context.out << tagText(tag) << '\n';
      context.out.flush();
    }
    return kExitSuccess;
  }
  for (const std::string &name : names) {
    if (!isLabel(context, name)) return kExitFailure;
    if (find(tags, name) == tags.end()) tags.push_back({name, 0});
  }
  return setTags(context, argument, item->itemIdentifier(), tags, json);
}

int runUntag(CommandContext &context, const std::string &argument, const std::vector<std::string> &names,
             bool json) {
  int exitStatus = kExitSuccess;
  const auto item = resolveForAction(context, argument, &exitStatus);
  if (!item) return exitStatus;
  Tags tags = FPGetTagsFromTagsData(item->fields().tagData);
  if (names.empty()) tags.clear();
  for (const std::string &name : names) {
    const auto found = find(tags, name);
    if (found == tags.end()) {
      context.err << "droxa: " << escapedText(argument) << ": it has no tag \"" << escapedText(name)
                  << "\"; `droxa tag` shows those it has" << std::endl;
      return kExitFailure;
    }
    tags.erase(found);
  }
  return setTags(context, argument, item->itemIdentifier(), tags, json);
}

}  // namespace droxa
