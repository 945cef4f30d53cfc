#include "cli/Commands.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ItemText.h"
#include "cli/PageReader.h"
#include "cli/Text.h"

namespace droxa {

namespace {

// Walks the folders depth first, holding one page of each folder on the way down. Aliases are shown, not
// followed.
class TreePrinter {
 public:
  TreePrinter(CommandContext &context, const TreeOptions &options) : context_(context), options_(options) {}

  // The first error doesn't end the walk: what else there is is shown.
  int printChildren(const std::string &identifier, const std::string &path, const std::string &indentation,
                    std::size_t depth) {
    const auto enumerator = context_.host->enumerator(identifier);
    if (!enumerator.value) return reportError(context_, path, enumerator.error);
    PageReader reader(*context_.host, enumerator.value, NSFileProviderInitialPageSortedByName());
    int status = kExitSuccess;
    auto item = reader.nextItem();
    while (item.value && context_.out.good()) {
      auto next = reader.nextItem();  // tells whether this one is the last
      const int below = printItem(item.value->fields(), path, indentation, depth, !next.value);
      if (status == kExitSuccess) status = below;
      item = std::move(next);
    }
    return item.error ? reportError(context_, path, item.error) : status;
  }

 private:
  int printItem(const NSFileProviderItemFields &item, const std::string &parent,
                const std::string &indentation, std::size_t depth, bool isLast) {
    const std::string path = (parent == "/" ? "" : parent) + "/" + item.filename;
    if (options_.json) {
      context_.out << treeJSON(item, path, depth) << '\n';
    } else {
      context_.out << indentation << (isLast ? "└── " : "├── ") << escapedText(item.filename) << '\n';
    }
    context_.out.flush();
    const bool goesDown =
        item.kind == NSFileProviderItemKind::folder && (!options_.depth || depth < *options_.depth);
    return goesDown
               ? printChildren(item.itemIdentifier, path, indentation + (isLast ? "    " : "│   "), depth + 1)
               : kExitSuccess;
  }

  CommandContext &context_;
  const TreeOptions &options_;
};

}  // namespace

int runTree(CommandContext &context, const TreeOptions &options) {
  const auto container = resolveContainer(*context.host, options.argument);
  if (container.error) return reportError(context, options.argument, container.error);
  const auto &item = container.value.item;
  const std::string path = options.argument.empty() ? "/" : options.argument;
  if (!options.json) context.out << escapedText(path) << std::endl;
  if (item && item->fields().kind != NSFileProviderItemKind::folder) {
    if (options.json) context.out << treeJSON(item->fields(), path, 0) << std::endl;
    return kExitSuccess;
  }
  if (options.depth == 0U) return kExitSuccess;
  return TreePrinter(context, options).printChildren(container.value.identifier, path, "", 1);
}

}  // namespace droxa
