#include <cerrno>
#include <filesystem>
#include <sysexits.h>
#include <system_error>

#include "cli/Acting.h"
#include "cli/ActionArgument.h"
#include "cli/Actions.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"

namespace droxa {

namespace {

namespace fs = std::filesystem;

// The file as it is named, with the folders that lead to it as they really are: a link is imported itself.
fs::path absolutePath(const std::string &file, std::error_code &failure) {
  fs::path path(file);
  while (!path.has_filename() && path.has_parent_path() && path != path.root_path())
    path = path.parent_path();
  const fs::path name = path.filename();
  if (name == "." || name == ".." || name.empty()) return fs::canonical(path, failure);
  const fs::path parent = fs::canonical(path.has_parent_path() ? path.parent_path() : ".", failure);
  if (!failure) (void)fs::symlink_status(parent / name, failure);
  return parent / name;
}

int importFile(CommandContext &context, const std::string &file, const std::string &folder, bool json) {
  std::error_code failure;
  const fs::path path = absolutePath(file, failure);
  if (!failure && !fs::exists(fs::symlink_status(path, failure))) failure = {ENOENT, std::generic_category()};
  if (failure) {
    context.err << "droxa: " << escapedText(file) << ": it can't be imported: " << failure.message()
                << std::endl;
    return failure.value() == EACCES ? EX_NOPERM : EX_NOINPUT;
  }
  FPDActionRequest request;
  request.kind = FPDActionRequest::Kind::importDocument;
  request.url = NSURL::fileURLWithPath(path.string());
  request.parentIdentifier = folder;
  const auto patience = json ? ActionPatience::untilStopped : ActionPatience::showingProgress;
  return reportAction(context, file, request, act(context, file, request, patience), json);
}

}  // namespace

int runImport(CommandContext &context, const std::vector<std::string> &files, const std::string &folder,
              bool json) {
  const auto parent = resolveFolder(context, folder);
  if (parent.error) return reportError(context, folder, parent.error);
  return forEachArgument(
      context, files, [&](const std::string &file) { return importFile(context, file, parent.value, json); });
}

}  // namespace droxa
